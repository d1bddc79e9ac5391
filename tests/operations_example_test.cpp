// The claims that docs/operations.md shows, compiled as they stand there.

#include "operations_example.h"

#include <sqlite3.h>

#include "store_test.h"

using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

class OperationsExampleTest : public StoreTest {
 protected:
  OperationsExampleTest() {
    Json::Value result;
    OAUTHDBGrantCode("oauth_grantCode").Add("alice", times(64, 'c'), "read", "xyz", "", result);
    OAUTHDBToken("oauth_token").Add("alice", times(64, 'c'), "read", "code", "xyz", "", result);
  }
  // What another process's lock makes of a claim.
  template <class Body>
  void whileLocked(const char* lock, Body body) const {
    sqlite3* other = nullptr;
    ASSERT_EQ(SQLITE_OK,
              sqlite3_open_v2(files_.database().c_str(), &other, SQLITE_OPEN_READWRITE, nullptr));
    EXPECT_EQ(SQLITE_OK, sqlite3_exec(other, lock, nullptr, nullptr, nullptr));
    body();
    sqlite3_close_v2(other);
  }
};

TEST_F(OperationsExampleTest, ClaimsOnce) {
  EXPECT_EQ(Claim::kMine, spendCode(1));
  EXPECT_EQ(Claim::kTaken, spendCode(1));
  EXPECT_EQ(Claim::kMine, rotateRefreshToken(1));
  EXPECT_EQ(Claim::kTaken, rotateRefreshToken(1));
}

TEST_F(OperationsExampleTest, RetriesWhileAnotherProcessWrites) {
  whileLocked("BEGIN IMMEDIATE", [] {
    EXPECT_EQ(Claim::kRetry, spendCode(1));
    EXPECT_EQ(Claim::kRetry, rotateRefreshToken(1));
  });
  EXPECT_EQ(Claim::kMine, spendCode(1));
  EXPECT_EQ(Claim::kMine, rotateRefreshToken(1));
}

TEST_F(OperationsExampleTest, RetriesWhereTheDatabaseCannotBeRead) {
  whileLocked("BEGIN EXCLUSIVE", [] {
    EXPECT_EQ(Claim::kRetry, spendCode(1));
    EXPECT_EQ(Claim::kRetry, rotateRefreshToken(1));
  });
  files_.removeDirectory();
  EXPECT_EQ(Claim::kRetry, spendCode(1));
  EXPECT_EQ(Claim::kRetry, rotateRefreshToken(1));
}

}  // namespace
