#include "oauth_grantCode.h"

#include <ctime>

#include "every_store.h"

using testing::ElementsAre;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;

namespace {

class GrantCodeTest : public RowStoreTest {
 protected:
  GrantCodeTest() : RowStoreTest(kCodes) {}
};

// --- Revoke ---

class GrantCodeRevokeTest : public GrantCodeTest {};

TEST_F(GrantCodeRevokeTest, ProlongsACodeThatExpiredBefore) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertExpiring("1", "5");
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ("1700000000", stored("expired_time"));
}

TEST_F(GrantCodeRevokeTest, KeepsTheRowForTheRestOfTheSecond) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(1, rowCount());
  clock_.advance(1);
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(0, rowCount());
}

TEST_F(GrantCodeRevokeTest, WritesMomentsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  clock_.set(4'294'967'297);
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ("4294967297", stored("expired_time"));
}

// --- Diagnostics ---

class GrantCodeTraceTest : public GrantCodeTest {};

TEST_F(GrantCodeTraceTest, IssuingTracesTheFullFormOnly) {
  Json::Value result;
  const Lines lines = traced(15, [&](Store& codes) {
    EXPECT_EQ(1, issue(static_cast<OAUTHDBGrantCode&>(codes), its_.row, result));
  });
  const std::string code = result["code"].asString();
  EXPECT_THAT(
      lines,
      ElementsAre(
          "3 oauth_grantCode.cpp ==> Add", "3 oauth_db_basic.cpp ==> DBCheckRowMax",
          "3 oauth_db_basic.cpp ==> DBGetRowCount", "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_grantCode;]",
          "3 oauth_db_basic.cpp ==> TabCountCallback", "3 oauth_db_basic.cpp Table Row Count[0]",
          "3 oauth_utils.cpp checkStrLen[alice]",
          "3 oauth_utils.cpp checkStrLen[" + times(64, 'c') + "]",
          "3 oauth_utils.cpp checkStrLen[read]", "3 oauth_utils.cpp checkStrLen[" + code + "]",
          "3 oauth_utils.cpp checkStrLen[1700000600]", "3 oauth_utils.cpp checkStrLen[xyz]",
          "3 oauth_db_basic.cpp ==> DBAdd", "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
          "3 oauth_db_basic.cpp ==> GetInsertParam", "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_grantCode (client_id, code, "
          "expired_time, id, ip, scope, state, username) VALUES('sealed:" +
              times(64, 'c') + "', '" + code +
              "', '1700000600', NULL, '192.0.2.7', 'read', 'xyz', 'alice');]",
          "3 oauth_db_basic.cpp [oauth_grantCode] Add success, changed[1]"));
}

}  // namespace
