#include "oauth_token.h"

#include <ctime>

#include "every_store.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrTokenExpired;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

class TokenTest : public RowStoreTest {
 protected:
  TokenTest() : RowStoreTest(kTokens) {}

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(OAUTHDBToken&)>& body) {
    return RowStoreTest::traced(mask,
                                [&](Store& store) { body(static_cast<OAUTHDBToken&>(store)); });
  }
};

// --- Add ---

class TokenAddTest : public TokenTest {};

TEST_F(TokenAddTest, AllowsEqualRefreshTokens) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, its_.row));
  EXPECT_EQ(1, add(tokens, with(its_.row, "access_token", times(64, 'b'))));
  EXPECT_EQ(2, rowCount());
}

// --- Add with tokens of its own ---

class TokenIssueTest : public TokenTest {};

TEST_F(TokenIssueTest, CountsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  clock_.set(2'147'483'647);
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(1, issue(tokens, its_.row, result));
  EXPECT_EQ("2147484247", stored("expired_time"));
  clock_.set(2'147'484'247);
  EXPECT_EQ(1, tokens.Verify(result["access_token"].asString(), result));
  clock_.set(2'147'484'248);
  EXPECT_EQ(0, tokens.Verify(result["access_token"].asString(), result));
}

TEST_F(TokenIssueTest, IssuesTokensThatAreValidIn2040) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  clock_.set(2'208'988'800);  // its first second
  OAUTHDBToken tokens("oauth_token");
  Json::Value issued, who;
  EXPECT_EQ(1, issue(tokens, its_.row, issued));
  EXPECT_EQ("2208989400", stored("expired_time"));
  EXPECT_EQ(1, tokens.Verify(issued["access_token"].asString(), who));
  EXPECT_EQ("alice", who["username"].asString());
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_EQ(1, rowCount());
}

// --- Look-ups ---

class TokenGetTest : public TokenTest {};

TEST_F(TokenGetTest, FindsEveryRowOfARefreshToken) {
  OAUTHDBToken tokens("oauth_token");
  const Row first = insertRow("1");
  const Row second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithRefreshToken(times(64, 'r'), &rows));
  EXPECT_EQ(list({document(first, "1"), document(second, "2")}), rows);
}

// --- Verify ---

class TokenVerifyTest : public TokenTest {
 protected:
  static Json::Value refusal(int code, const std::string& msg) {
    Json::Value result;
    result["err_code"] = code;
    result["err_msg"] = msg;
    return result;
  }
};

TEST_F(TokenVerifyTest, TellsWhoseTokenItIs) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, its_.row));
  Json::Value result;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
  Json::Value expected;
  expected["username"] = "alice";
  expected["scope"] = "read";
  expected["state"] = "xyz";
  EXPECT_EQ(expected, result);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenVerifyTest, OverwritesItsOwnKeysAlone) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, its_.row));
  Json::Value result;
  result["username"] = "mallory";
  result["err_code"] = 5;
  result["other"] = true;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
  Json::Value expected;
  expected["username"] = "alice";
  expected["scope"] = "read";
  expected["state"] = "xyz";
  expected["err_code"] = 5;
  expected["other"] = true;
  EXPECT_EQ(expected, result);
}

TEST_F(TokenVerifyTest, LeavesOtherKeysOfARefusal) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  result["username"] = "mallory";
  EXPECT_EQ(0, tokens.Verify(times(64), result));
  Json::Value expected = refusal(kErrTokenExpired, "Access Token Expired");
  expected["username"] = "mallory";
  EXPECT_EQ(expected, result);
}

TEST_F(TokenVerifyTest, ReturnsQuotesAsTheyAreStored) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, with(its_.row, "username", "O'Hara")));
  Json::Value result;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
  EXPECT_EQ("O''Hara", result["username"].asString());
}

TEST_F(TokenVerifyTest, AcceptsTheVerySecondOfExpiry) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, its_.row));
  clock_.set(1'700'000'600);
  Json::Value result;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
}

TEST_F(TokenVerifyTest, RefusesTheSecondAfterExpiry) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, its_.row));
  recordEarlierError(tokens);
  clock_.set(1'700'000'601);
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64, 'a'), result));
  EXPECT_EQ(refusal(-3, "Access Token Expired"), result);
  expectEarlierError(tokens);
  EXPECT_THAT(log_.lines(), IsEmpty());
  EXPECT_THAT(rows(), ElementsAre(printed(its_.row)));
}

TEST_F(TokenVerifyTest, ReportsAnUnknownTokenAsExpired) {
  OAUTHDBToken tokens("oauth_token");
  recordEarlierError(tokens);
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64), result));
  EXPECT_EQ(refusal(-3, "Access Token Expired"), result);
  expectEarlierError(tokens);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenVerifyTest, CopiesTheLookupsErrorForABadLength) {
  OAUTHDBToken tokens("oauth_token");
  for (const int length : {0, 10, 63, 65}) {
    SCOPED_TRACE(length);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, tokens.Verify(times(length), result));
    EXPECT_EQ(refusal(-2, "Bad parameters"), result);
    expectError(tokens, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
  }
}

TEST_F(TokenVerifyTest, CopiesTheDatabasesErrorAfterAFailedRead) {
  OAUTHDBToken tokens("oauth_token");
  dropTable();
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64), result));
  EXPECT_EQ(refusal(1, "no such table: oauth_token"), result);
  expectError(tokens, 1, "no such table: oauth_token");
  EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Get", "no such table: oauth_token", 1)));
}

TEST_F(TokenVerifyTest, ComparesTheExpiryAsANumber) {
  OAUTHDBToken tokens("oauth_token");
  for (const auto& [expiry, valid] : kExpiries) {
    SCOPED_TRACE("'" + expiry + "'");
    emptyTable();
    const Row row = insertExpiring("1", expiry);
    Json::Value result;
    EXPECT_EQ(valid ? 1 : 0, tokens.Verify(row.at("access_token"), result));
    EXPECT_EQ(!valid, result.isMember("err_code"));
  }
}

TEST_F(TokenVerifyTest, ComparesClocksBeforeTheEpochWithTheirSign) {
  OAUTHDBToken tokens("oauth_token");
  const Row earlier = insertExpiring("1", "-11");
  const Row later = insertExpiring("2", "-10");
  clock_.set(-10);
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(earlier.at("access_token"), result));
  EXPECT_EQ(1, tokens.Verify(later.at("access_token"), result));
}

// --- Diagnostics ---

class TokenTraceTest : public TokenTest {};

TEST_F(TokenTraceTest, IssuingTracesBothForms) {
  Json::Value result;
  const Lines lines =
      traced(15, [&](OAUTHDBToken& tokens) { EXPECT_EQ(1, issue(tokens, its_.row, result)); });
  const std::string access_token = result["access_token"].asString();
  const std::string refresh_token = result["refresh_token"].asString();
  EXPECT_THAT(
      lines,
      ElementsAre(
          "3 oauth_token.cpp ==> Add", "3 oauth_token.cpp ==> Add",
          "3 oauth_db_basic.cpp ==> DBCheckRowMax", "3 oauth_db_basic.cpp ==> DBGetRowCount",
          "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_token;]",
          "3 oauth_db_basic.cpp ==> TabCountCallback", "3 oauth_db_basic.cpp Table Row Count[0]",
          "3 oauth_utils.cpp checkStrLen[alice]",
          "3 oauth_utils.cpp checkStrLen[" + times(64, 'c') + "]",
          "3 oauth_utils.cpp checkStrLen[read]",
          "3 oauth_utils.cpp checkStrLen[" + refresh_token + "]",
          "3 oauth_utils.cpp checkStrLen[" + access_token + "]",
          "3 oauth_utils.cpp checkStrLen[1700000600]", "3 oauth_utils.cpp checkStrLen[code]",
          "3 oauth_utils.cpp checkStrLen[xyz]", "3 oauth_db_basic.cpp ==> DBAdd",
          "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
          "3 oauth_db_basic.cpp ==> GetInsertParam", "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_token (access_token, client_id, "
          "expired_time, flow_type, id, ip, refresh_token, scope, state, username) VALUES('" +
              access_token + "', 'sealed:" + times(64, 'c') +
              "', '1700000600', 'code', NULL, '192.0.2.7', '" + refresh_token +
              "', 'read', 'xyz', 'alice');]",
          "3 oauth_db_basic.cpp [oauth_token] Add success, changed[1]"));
  EXPECT_EQ("%s:%d ==> %s", log_.formats().front());
}

TEST_F(TokenTraceTest, FullFormTracesItselfOnce) {
  const Lines lines = traced(
      8, [&](OAUTHDBToken& tokens) { EXPECT_EQ(0, add(tokens, with(its_.row, "username", ""))); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_token.cpp ==> Add", "3 oauth_db_basic.cpp ==> DBCheckRowMax",
                  "3 oauth_db_basic.cpp ==> DBGetRowCount", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_token;]",
                  "3 oauth_db_basic.cpp ==> TabCountCallback", "3 oauth_token.cpp Bad parameters"));
}

TEST_F(TokenTraceTest, VerifyingTracesTheLookup) {
  createDatabase();
  const Row row = insertRow("1");
  const Lines lines = traced(15, [&](OAUTHDBToken& tokens) {
    Json::Value result;
    EXPECT_EQ(1, tokens.Verify(row.at("access_token"), result));
  });
  EXPECT_THAT(
      lines,
      ElementsAre(
          "3 oauth_token.cpp ==> Verify", "3 oauth_token.cpp ==> GetWithAccessToken",
          "3 oauth_utils.cpp checkStrLen[1" + times(63, 'a') + "]",
          "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> GetConditionParam",
          "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_token WHERE access_token='1" +
              times(63, 'a') + "' ;]",
          "3 oauth_db_basic.cpp ==> TabGetCallback",
          "3 oauth_db_basic.cpp ##### [0][username = alice]",
          "3 oauth_db_basic.cpp ##### [1][client_id = sealed:" + times(64, 'c') + "]",
          "3 oauth_db_basic.cpp ##### [2][scope = read]",
          "3 oauth_db_basic.cpp ##### [3][refresh_token = " + times(64, 'r') + "]",
          "3 oauth_db_basic.cpp ##### [4][access_token = 1" + times(63, 'a') + "]",
          "3 oauth_db_basic.cpp ##### [5][expired_time = 1700000600]",
          "3 oauth_db_basic.cpp ##### [6][flow_type = code]",
          "3 oauth_db_basic.cpp ##### [7][state = xyz]",
          "3 oauth_db_basic.cpp ##### [8][ip = 192.0.2.7]",
          "3 oauth_db_basic.cpp ##### [9][id = 1]",
          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
          "3 oauth_db_basic.cpp ClientInfo Get Done"));
}

// --- A store that could not be opened ---

class UnopenedTokenTest : public TokenTest {};

TEST_F(UnopenedTokenTest, VerifiesNothing) {
  files_.removeDirectory();
  OAUTHDBToken tokens("oauth_token");
  log_.clear();
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64), result));
  EXPECT_THAT(log_.lines(), ElementsAreArray(unready("Get")));
  expectError(tokens, -1, "Create table failed");
  Json::Value expected;
  expected["err_code"] = -1;
  expected["err_msg"] = "Create table failed";
  EXPECT_EQ(expected, result);
}

}  // namespace
