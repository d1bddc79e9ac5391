#include "oauth_log.h"
#include "oauthctl_test.h"

namespace {

class LogTest : public OauthctlTest {
 protected:
  // Adds the lines, and replaces the times that SQLite's clock gave them by known ones.
  void addLines(const Lines& messages) const {
    for (const std::string& message : messages)
      EXPECT_TRUE(ZEVOOAUTHSERVER::OAUTHDBLog("oauth_log").Add(message));
    execute("UPDATE oauth_log SET timestamp = " + std::to_string(kNow) + " - 10 + id");
  }
};

TEST_F(LogTest, ShowsTheNewestLineLast) {
  addLines({"first", "it's the second", "third"});
  EXPECT_EQ(
      "TIME                MESSAGE\n"
      "2023-11-14 22:13:11 first\n"
      "2023-11-14 22:13:12 it's the second\n"
      "2023-11-14 22:13:13 third\n",
      run({"log"}).out);
}

TEST_F(LogTest, ShowsLocalTime) {
  addLines({"first"});
  environment_ = {"TZ=UTC-2"};
  EXPECT_EQ("TIME                MESSAGE\n2023-11-15 00:13:11 first\n", run({"log"}).out);
}

TEST_F(LogTest, ShowsTheLastLinesOfThoseThatMatch) {
  addLines({"Album 1", "Album 2", "other", "album 3"});
  const Json::Value lines = json({"log", "--match", "ALBUM", "--last", "2"});
  ASSERT_EQ(2U, lines.size());
  EXPECT_EQ("Album 2", lines[0U]["msg"].asString());
  EXPECT_EQ("album 3", lines[1U]["msg"].asString());
  EXPECT_EQ(kNow - 8, lines[0U]["timestamp"].asInt64());
  EXPECT_EQ(4U, json({"log", "--last", "99"}).size());
}

TEST_F(LogTest, MatchesLiterally) {
  addLines({"100 %", "a_b's", "other"});
  EXPECT_EQ(1U, json({"log", "--match", "%"}).size());
  EXPECT_EQ(1U, json({"log", "--match", "_"}).size());
  EXPECT_EQ(1U, json({"log", "--match", "b's"}).size());
  EXPECT_EQ("1 no line of the audit log contains 'x%'", complaint(run({"log", "--match", "x%"})));
}

TEST_F(LogTest, ClearsTheLog) {
  addLines({"first", "second"});
  EXPECT_EQ("2 nobody is there to ask \"Delete all 2 lines of the audit log?\": add --yes",
            complaint(run({"log", "clear"})));
  EXPECT_EQ(2, rowCount("oauth_log"));
  EXPECT_EQ("deleted 2 lines\n", run({"log", "clear", "--yes"}).out);
  EXPECT_EQ(0, rowCount("oauth_log"));
  EXPECT_EQ("nothing to delete: the audit log is empty\n", run({"log", "clear"}).out);
  EXPECT_EQ("no lines\n", run({"log"}).out);
}

}  // namespace
