// The functions that docs/operations.md shows, compiled from that page.

#include "operations_example.h"

#include <sqlite3.h>

#include "store_test.h"

using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

class OperationsExampleTest : public StoreTest {
 protected:
  OperationsExampleTest() {
    code_ = issueCode("alice");
    Json::Value issued;
    OAUTHDBToken("oauth_token").Add("alice", times(64, 'c'), "read", "code", "xyz", "", issued);
    refreshToken_ = issued["refresh_token"].asString();
  }
  static std::string issueCode(const std::string& user) {
    Json::Value issued;
    OAUTHDBGrantCode("oauth_grantCode").Add(user, times(64, 'c'), "read", "xyz", "", issued);
    return issued["code"].asString();
  }
  void expectBoth(Claim claim) {
    EXPECT_EQ(claim, spendCode(code_, row_));
    EXPECT_EQ(claim, rotateRefreshToken(refreshToken_, row_));
  }
  // Runs the body while another process holds the lock.
  template <class Body>
  void whileLocked(const char* lock, Body body) const {
    sqlite3* other = nullptr;
    ASSERT_EQ(SQLITE_OK,
              sqlite3_open_v2(files_.database().c_str(), &other, SQLITE_OPEN_READWRITE, nullptr));
    EXPECT_EQ(SQLITE_OK, sqlite3_exec(other, lock, nullptr, nullptr, nullptr));
    body();
    sqlite3_close_v2(other);
  }

  std::string code_, refreshToken_;
  Json::Value row_;
};

TEST_F(OperationsExampleTest, ClaimsOnce) {
  EXPECT_EQ(Claim::kMine, spendCode(code_, row_));
  EXPECT_EQ(code_, row_["code"].asString());
  EXPECT_EQ(Claim::kMine, rotateRefreshToken(refreshToken_, row_));
  EXPECT_EQ(refreshToken_, row_["refresh_token"].asString());
  row_ = Json::Value();
  expectBoth(Claim::kTaken);
  EXPECT_EQ(Json::Value(), row_);
}

TEST_F(OperationsExampleTest, ReportsATextOfABadLengthAsTaken) {
  EXPECT_EQ(Claim::kTaken, spendCode("short", row_));
  EXPECT_EQ(Claim::kTaken, rotateRefreshToken("short", row_));
  expectBoth(Claim::kMine);
}

// Two processes look up a code. Before the second one deletes it, a new code has got its id.
TEST_F(OperationsExampleTest, ClaimsNoOtherRowThatGotTheSameId) {
  ASSERT_EQ(Claim::kMine, spendCode(code_, row_));
  const std::string next = issueCode("bob");
  Json::Value rows;
  OAUTHDBGrantCode("oauth_grantCode").Get(next, &rows);
  ASSERT_EQ(row_["id"], rows[0U]["id"]);
  EXPECT_EQ(Claim::kTaken, spendCode(code_, row_));
  EXPECT_EQ(Claim::kMine, spendCode(next, row_));
}

TEST_F(OperationsExampleTest, RetriesWhileAnotherProcessWrites) {
  whileLocked("BEGIN IMMEDIATE", [this] { expectBoth(Claim::kRetry); });
  expectBoth(Claim::kMine);
}

TEST_F(OperationsExampleTest, RetriesWhereTheDatabaseCannotBeRead) {
  whileLocked("BEGIN EXCLUSIVE", [this] { expectBoth(Claim::kRetry); });
  files_.removeDirectory();
  expectBoth(Claim::kRetry);
}

}  // namespace
