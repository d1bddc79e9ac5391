// The example of examples/lifecycle.cpp, its main() called by another name.

#include <unistd.h>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::HasSubstr;
using namespace ZEVOOAUTHSERVER;

int lifecycleMain();

namespace {

FakeClock* clockOfSleep = nullptr;

class LifecycleTest : public StoreTest {
 protected:
  LifecycleTest() { clockOfSleep = &clock_; }
  ~LifecycleTest() override { clockOfSleep = nullptr; }

  void run() {
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    exitCode_ = lifecycleMain();
    output_ = testing::internal::GetCapturedStdout();
    errors_ = testing::internal::GetCapturedStderr();
  }

  std::vector<std::string> allRows() const {
    std::vector<std::string> rows;
    for (const std::string table :
         {"oauth_meta", "oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"})
      for (const std::string& row : query("SELECT * FROM " + table))
        rows.push_back(std::string(table).append(": ").append(row));
    return rows;
  }

  int exitCode_ = -1;
  std::string output_, errors_;
};

TEST_F(LifecycleTest, ShowsTheWholeLifecycle) {
  run();
  EXPECT_EQ(0, exitCode_);
  EXPECT_EQ("", errors_);
  const char* const moments[] = {
      "A client application registers",
      "client_id = sealed:",
      "client_secret = sealed:",
      "redirect_uri = album.example/callback",
      "deleted: yes; a second try finds nothing",
      "a resource server asks: yes, this is alice with scope \"read\"",
      "the old access token: no, Access Token Expired [-3]",
      "the new access token: yes, this is alice with scope \"read\"",
      "at once          : yes, this is alice with scope \"read\"",
      "three seconds on : no, Access Token Expired [-3]",
      "the expired token is gone",
      "Application registed[Photo album ",
      "The rows as they lie in the file",
      "The rows that this demo made are removed again.",
  };
  std::size_t at = 0;
  for (const char* const moment : moments) {
    at = output_.find(moment, at);
    ASSERT_NE(std::string::npos, at) << moment << " is missing after the one before in\n"
                                     << output_;
  }
}

TEST_F(LifecycleTest, RemovesTheRowsItMade) {
  run();
  EXPECT_EQ(0, exitCode_);
  for (const char* const table :
       {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"})
    EXPECT_EQ(0, rowCount(table)) << table;
}

TEST_F(LifecycleTest, KeepsTheRowsOfOthers) {
  Json::Value result;
  OAUTHDBClientInfo("oauth_clientInfo").Add("https://other.example", "read", "Other", result);
  OAUTHDBToken("oauth_token").Add("bob", times(64), "read", "code", "s", "", result);
  const std::vector<std::string> before = allRows();
  run();
  EXPECT_EQ(0, exitCode_);
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, LeavesExpiredRowsOfOthersToTheirOwner) {
  Json::Value result;
  OAUTHDBToken("oauth_token").Add("bob", times(64), "read", "code", "s", "", result);
  clock_.advance(100'000);
  const std::vector<std::string> before = allRows();
  run();
  EXPECT_EQ(0, exitCode_);
  EXPECT_THAT(output_, HasSubstr("skipped: this file holds expired rows of others"));
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, LeavesExpiredCodesOfOthersToTheirOwner) {
  Json::Value result;
  OAUTHDBGrantCode("oauth_grantCode").Add("bob", times(64), "read", "s", "", result);
  clock_.advance(100'000);
  const std::vector<std::string> before = allRows();
  run();
  EXPECT_EQ(0, exitCode_);
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, LeavesTokensOfOthersWhoseExpiryIsNoPlainNumber) {
  for (const std::string expiry : {"1900000000 ", "+1900000000", "never", "99999999999999999999"}) {
    SCOPED_TRACE(expiry);
    Json::Value result;
    OAUTHDBToken("oauth_token")
        .Add("bob", times(64), "read", times(64, 'r'), times(64, 'a'), expiry, "code", "s", "",
             result);
    const std::vector<std::string> before = allRows();
    run();
    EXPECT_EQ(0, exitCode_);
    EXPECT_EQ(before, allRows());
    execute("DELETE FROM oauth_token");
  }
}

TEST_F(LifecycleTest, RemovesItsAuditLineWhenItsClientCannotBeFound) {
  OAUTHDBLog("oauth_log").Add("one");
  const std::vector<std::string> before = allRows();
  host_.failEncrypt(3);  // after identifier and secret, that of the look-up
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ(
      "lifecycle: cannot find the client in /var/packages/Keyloft/target/etc/oauth.db:"
      " Data Decrypt failed\n",
      errors_);
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, FailsWhenRowsAreLeftBehind) {
  OAUTHDBLog("oauth_log").Add("one");
  execute(
      "CREATE TRIGGER t BEFORE DELETE ON oauth_clientInfo BEGIN SELECT RAISE(ABORT, 'no'); END");
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ("lifecycle: some rows of this demo could not be removed\n", errors_);
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
}

TEST_F(LifecycleTest, RefusesToPushOutAuditLinesOfOthers) {
  writeSettings(R"({"log_max": 2})");
  OAUTHDBLog log("oauth_log");
  log.Add("one");
  log.Add("two");
  const std::vector<std::string> before = allRows();
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ(
      "lifecycle: the audit log is full (log_max 2): one more line would push out an older one\n",
      errors_);
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, SaysInOneLineThatItCannotWrite) {
  files_.removeDirectory();
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ("", output_);
  EXPECT_EQ(
      "lifecycle: cannot use /var/packages/Keyloft/target/etc/oauth.db: Create table failed"
      " (run as a user who may write there)\n",
      errors_);
}

TEST_F(LifecycleTest, SaysInOneLineThatTheFileIsReadOnly) {
  OAUTHDBLog("oauth_log").Add("one");
  const std::vector<std::string> before = allRows();
  files_.openReadOnly();
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ(
      "lifecycle: cannot register a client in /var/packages/Keyloft/target/etc/oauth.db:"
      " attempt to write a readonly database\n",
      errors_);
  EXPECT_EQ(before, allRows());
}

TEST_F(LifecycleTest, RemovesItsRowsWhenAStepFails) {
  OAUTHDBLog("oauth_log").Add("one");
  execute("CREATE TRIGGER t BEFORE INSERT ON oauth_token BEGIN SELECT RAISE(ABORT, 'no'); END");
  const std::vector<std::string> before = allRows();
  run();
  EXPECT_EQ(1, exitCode_);
  EXPECT_EQ("lifecycle: cannot issue tokens in /var/packages/Keyloft/target/etc/oauth.db: no\n",
            errors_);
  EXPECT_EQ(before, allRows());
}

}  // namespace

// The demo waits until a token expires. With the fake clock that takes no time.
extern "C" unsigned sleep(unsigned seconds) {
  clockOfSleep->advance(seconds);
  return 0;
}
