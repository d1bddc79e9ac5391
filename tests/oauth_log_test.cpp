#include "oauth_log.h"

#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace {

class LogTest : public StoreTest {
 protected:
  // Moves every row into the past, so that the next write falls into a second of its own.
  void ageRowsBy(int seconds) const {
    execute("UPDATE oauth_log SET timestamp = timestamp - " + std::to_string(seconds));
  }
};

TEST_F(LogTest, TrimsToTheNewestRowsInDifferentSeconds) {
  writeSettings(R"({"log_max": 3})");
  OAUTHDBLog log("oauth_log");
  for (const char* const msg : {"one", "two", "three", "four"}) {
    ageRowsBy(10);
    EXPECT_EQ(1, log.Add(msg));
  }
  EXPECT_THAT(query("SELECT msg FROM oauth_log ORDER BY id"), ElementsAre("two", "three", "four"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

}  // namespace
