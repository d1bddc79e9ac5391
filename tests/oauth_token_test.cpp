#include "oauth_token.h"

#include <json/writer.h>

#include <cerrno>
#include <ctime>
#include <functional>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "store_test.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::MatchesRegex;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrCreateTable;
using ZEVOOAUTHSERVER::kErrCrypt;
using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::kErrTableFull;
using ZEVOOAUTHSERVER::kErrTokenExpired;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

// Every column of a row but its id. The clock of the tests starts 600 seconds before its expiry.
struct Grant {
  std::string username = "alice";
  std::string client_id = times(64, 'c');
  std::string scope = "read";
  std::string refresh_token = times(64, 'r');
  std::string access_token = times(64, 'a');
  std::string expired_time = "1700000600";
  std::string flow_type = "code";
  std::string state = "xyz";
  std::string ip = "192.0.2.7";
};

using Member = std::string Grant::*;

Grant grantWith(Member member, const std::string& value) {
  Grant grant;
  grant.*member = value;
  return grant;
}

struct LengthRule {
  Member member;
  const char* column;
  int min, max;
};
const LengthRule kUserName{&Grant::username, "username", 1, 256};
const LengthRule kClientId{&Grant::client_id, "client_id", 64, 64};
const LengthRule kScope{&Grant::scope, "scope", 1, 2048};
const LengthRule kRefreshToken{&Grant::refresh_token, "refresh_token", 64, 64};
const LengthRule kAccessToken{&Grant::access_token, "access_token", 64, 64};
const LengthRule kExpiredTime{&Grant::expired_time, "expired_time", 1, 128};
const LengthRule kFlowType{&Grant::flow_type, "flow_type", 1, 32};
const LengthRule kState{&Grant::state, "state", 1, 2048};

// In the order in which each operation checks.
const std::vector<LengthRule> kAddRules{kUserName,    kClientId,    kScope,    kRefreshToken,
                                        kAccessToken, kExpiredTime, kFlowType, kState};
const std::vector<LengthRule> kShortEditRules{kUserName, kClientId, kScope, kFlowType, kState};
const std::vector<LengthRule> kLongEditRules{kUserName,    kClientId, kScope,
                                             kExpiredTime, kFlowType, kState};

Json::Value bothTokens(const Grant& grant) {
  Json::Value result;
  result["access_token"] = grant.access_token;
  result["refresh_token"] = grant.refresh_token;
  return result;
}

int add(OAUTHDBToken& tokens, const Grant& grant, Json::Value& result) {
  return tokens.Add(grant.username, grant.client_id, grant.scope, grant.refresh_token,
                    grant.access_token, grant.expired_time, grant.flow_type, grant.state, grant.ip,
                    result);
}
int add(OAUTHDBToken& tokens, const Grant& grant) {
  Json::Value result;
  return add(tokens, grant, result);
}
int issue(OAUTHDBToken& tokens, const Grant& grant, Json::Value& result) {
  return tokens.Add(grant.username, grant.client_id, grant.scope, grant.flow_type, grant.state,
                    grant.ip, result);
}
int shortEdit(OAUTHDBToken& tokens, long long id, const Grant& grant) {
  return tokens.Edit(id, grant.username, grant.client_id, grant.scope, grant.flow_type,
                     grant.state);
}
int longEdit(OAUTHDBToken& tokens, long long id, const Grant& grant) {
  return tokens.Edit(id, grant.username, grant.client_id, grant.scope, grant.expired_time,
                     grant.flow_type, grant.state);
}

class TokenTest : public StoreTest {
 protected:
  static void createDatabase() { const OAUTHDBToken tokens("oauth_token"); }

  // A row as query() prints it.
  static std::string row(const Grant& grant, const std::string& id = "1") {
    return grant.username + "|" + FakeHost::sealed(grant.client_id) + "|" + grant.scope + "|" +
           grant.refresh_token + "|" + grant.access_token + "|" + grant.expired_time + "|" +
           grant.flow_type + "|" + grant.state + "|" + grant.ip + "|" + id;
  }
  Lines rows() const { return query("SELECT * FROM oauth_token ORDER BY id"); }
  Lines ids() const { return query("SELECT id FROM oauth_token ORDER BY id"); }
  std::string stored(const char* column) const {
    return query(std::string("SELECT ") + column + " FROM oauth_token").at(0);
  }

  // Writes a row past the store, where no length rule holds. An id serves as the token's
  // beginning, so that tokens differ.
  Grant insertRow(const std::string& id, const std::string& expired_time = "1700000600") const {
    Grant grant;
    grant.expired_time = expired_time;
    grant.access_token.replace(0, id.size(), id);
    execute("INSERT INTO oauth_token VALUES('" + grant.username + "', '" +
            FakeHost::sealed(grant.client_id) + "', '" + grant.scope + "', '" +
            grant.refresh_token + "', '" + grant.access_token + "', '" + expired_time + "', '" +
            grant.flow_type + "', '" + grant.state + "', '" + grant.ip + "', " + id + ")");
    return grant;
  }
  void refuseDeletes(const std::string& condition) const {
    execute("CREATE TRIGGER refusal BEFORE DELETE ON oauth_token WHEN " + condition +
            " BEGIN SELECT RAISE(ABORT, 'kept'); END");
  }

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(OAUTHDBToken&)>& body) {
    withDiagnostics(mask, [&] {
      OAUTHDBToken tokens("oauth_token");
      log_.clear();
      body(tokens);
    });
    return log_.lines();
  }

  using Operation = std::function<int(OAUTHDBToken&, const Grant&)>;

  // Both bounds of every rule are accepted; one byte beyond either is an error.
  void expectLengthRules(const std::vector<LengthRule>& rules, const Operation& operation,
                         const std::function<void()>& prepare) {
    OAUTHDBToken tokens("oauth_token");
    for (const LengthRule& rule : rules)
      for (const int length : {rule.min - 1, rule.min, rule.max, rule.max + 1}) {
        SCOPED_TRACE(rule.column + std::string(" of ") + std::to_string(length) + " bytes");
        prepare();
        const Lines before = rows();
        recordEarlierError(tokens);
        log_.clear();
        const int done = operation(tokens, grantWith(rule.member, times(length, '1')));
        if (length < rule.min || length > rule.max) {
          EXPECT_EQ(0, done);
          expectError(tokens, kErrBadParameters, "Bad parameters");
          EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
          EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
          EXPECT_EQ(before, rows());
        } else {
          EXPECT_EQ(1, done);
          expectEarlierError(tokens);
          EXPECT_THAT(log_.lines(), IsEmpty());
        }
      }
  }

  // With one value after the other too long, each operation names what it checked up to there.
  void expectCheckOrder(const std::vector<LengthRule>& rules, const Operation& operation) {
    Lines checked;
    for (const LengthRule& rule : rules) {
      const Grant bad = grantWith(rule.member, times(rule.max + 1, '1'));
      checked.push_back("3 oauth_utils.cpp checkStrLen[" + Grant().*rule.member + "]");
      Lines expected = checked;
      expected.back() = "3 oauth_utils.cpp checkStrLen[" + bad.*rule.member + "]";
      expected.emplace_back("3 oauth_token.cpp Bad parameters");
      EXPECT_THAT(traced(4, [&](OAUTHDBToken& tokens) { operation(tokens, bad); }),
                  ElementsAreArray(expected))
          << rule.column;
    }
  }
};

// --- Without random bytes ---

// A token that could be guessed would be worse than none.
TEST_F(TokenTest, IssuesNothingWithoutRandomBytes) {
  OAUTHDBToken tokens("oauth_token");
  files_.failRandomCall(ENOSYS);
  files_.removeRandomDevice();
  Json::Value result;
  EXPECT_EQ(0, tokens.Add("alice", times(64), "read", "code", "xyz", "", result));
  EXPECT_EQ(-2, tokens.GetErrCode());
  EXPECT_EQ("Bad parameters", tokens.GetErrMsg());
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
  EXPECT_EQ(0U, result.size());
  EXPECT_EQ(0, rowCount("oauth_token"));
}

// --- Add with the caller's values ---

class TokenAddTest : public TokenTest {};

TEST_F(TokenAddTest, StoresEveryColumn) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  EXPECT_THAT(rows(), ElementsAre("alice|sealed:" + times(64, 'c') + "|read|" + times(64, 'r') +
                                  "|" + times(64, 'a') + "|1700000600|code|xyz|192.0.2.7|1"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenAddTest, ReturnsTheTokensAlone) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(1, add(tokens, Grant(), result));
  EXPECT_EQ(bothTokens(Grant()), result);
}

TEST_F(TokenAddTest, LeavesOtherKeysOfTheResult) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  result["token_type"] = "bearer";
  result["access_token"] = "stale";
  EXPECT_EQ(1, add(tokens, Grant(), result));
  Json::Value expected = bothTokens(Grant());
  expected["token_type"] = "bearer";
  EXPECT_EQ(expected, result);
}

TEST_F(TokenAddTest, KeepsAnEarlierErrorOnSuccess) {
  OAUTHDBToken tokens("oauth_token");
  recordEarlierError(tokens);
  EXPECT_EQ(1, add(tokens, Grant()));
  expectEarlierError(tokens);
}

TEST_F(TokenAddTest, AcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(
      kAddRules, [](OAUTHDBToken& tokens, const Grant& grant) { return add(tokens, grant); },
      [this] { execute("DELETE FROM oauth_token"); });
}

TEST_F(TokenAddTest, StopsAtTheFirstBadLength) {
  expectCheckOrder(kAddRules,
                   [](OAUTHDBToken& tokens, const Grant& grant) { return add(tokens, grant); });
}

TEST_F(TokenAddTest, LeavesTheResultUntouchedAfterABadLength) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::access_token, times(63)), result));
  EXPECT_EQ(Json::Value(), result);
  expectError(tokens, kErrBadParameters, "Bad parameters");
}

TEST_F(TokenAddTest, MeasuresLengthsInBytes) {
  OAUTHDBToken tokens("oauth_token");
  std::string flow_type;
  for (int i = 0; i < 16; ++i) flow_type += "\u00e9";
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::flow_type, flow_type)));
  EXPECT_EQ(flow_type, stored("flow_type"));
  execute("DELETE FROM oauth_token");
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::flow_type, flow_type + "\u00e9")));
  EXPECT_THAT(rows(), IsEmpty());
}

struct StoredValue {
  Member member;
  const char* column;
  std::string given, stored;
};

TEST_F(TokenAddTest, StoresASingleQuoteDoubledInEveryColumn) {
  const StoredValue values[] = {
      {&Grant::username, "username", "O'Hara", "O''Hara"},
      {&Grant::client_id, "client_id", times(63, 'c') + "'",
       FakeHost::sealed(times(63, 'c') + "''")},
      {&Grant::scope, "scope", "'", "''"},
      {&Grant::refresh_token, "refresh_token", "'" + times(63, 'r'), "''" + times(63, 'r')},
      {&Grant::access_token, "access_token", "'" + times(63, 'a'), "''" + times(63, 'a')},
      {&Grant::expired_time, "expired_time", "17'00", "17''00"},
      {&Grant::flow_type, "flow_type", "a'b", "a''b"},
      {&Grant::state, "state", "''", "''''"},
      {&Grant::ip, "ip", "fe80::1%a'b", "fe80::1%a''b"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const StoredValue& value : values) {
    SCOPED_TRACE(value.column);
    execute("DELETE FROM oauth_token");
    EXPECT_EQ(1, add(tokens, grantWith(value.member, value.given)));
    EXPECT_EQ(value.stored, stored(value.column));
  }
}

TEST_F(TokenAddTest, ReturnsTokensWithTheirQuotesAsGiven) {
  OAUTHDBToken tokens("oauth_token");
  Grant grant;
  grant.access_token = "'" + times(63, 'a');
  grant.refresh_token = "'" + times(63, 'r');
  Json::Value result;
  EXPECT_EQ(1, add(tokens, grant, result));
  EXPECT_EQ(bothTokens(grant), result);
}

TEST_F(TokenAddTest, KeepsStatementsInsideAValueAsText) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::state, "x'); DROP TABLE oauth_token; --")));
  EXPECT_EQ("x''); DROP TABLE oauth_token; --", stored("state"));
}

TEST_F(TokenAddTest, EndsEveryValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  const StoredValue values[] = {
      {&Grant::username, "username", "al" + nul + "ice", "al"},
      {&Grant::client_id, "client_id", "c" + nul + times(62, 'x'), FakeHost::sealed("c")},
      {&Grant::scope, "scope", nul + "read", ""},
      {&Grant::refresh_token, "refresh_token", "r" + nul + times(62, 'x'), "r"},
      {&Grant::access_token, "access_token", "a" + nul + times(62, 'x'), "a"},
      {&Grant::expired_time, "expired_time", "17" + nul + "00", "17"},
      {&Grant::flow_type, "flow_type", "co" + nul + "'de", "co"},
      {&Grant::state, "state", "xyz" + nul, "xyz"},
      {&Grant::ip, "ip", "192.0.2.7" + nul + "'", "192.0.2.7"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const StoredValue& value : values) {
    SCOPED_TRACE(value.column);
    execute("DELETE FROM oauth_token");
    EXPECT_EQ(1, add(tokens, grantWith(value.member, value.given)));
    EXPECT_EQ(value.stored, stored(value.column));
  }
}

TEST_F(TokenAddTest, AcceptsAddressesOfBothFamilies) {
  OAUTHDBToken tokens("oauth_token");
  for (const std::string ip :
       {"192.168.1.20", "0.0.0.0", "255.255.255.255", "::", "::1", "2001:DB8::7",
        "::ffff:192.0.2.7", "2001:0db8:0000:0000:0000:0000:0000:0007", "fe80::1%1", "fe80::1%lo",
        "fe80::1%no-such-interface", "2001:db8::7%4294967295", "fe80::1%"}) {
    SCOPED_TRACE(ip);
    execute("DELETE FROM oauth_token");
    EXPECT_EQ(1, add(tokens, grantWith(&Grant::ip, ip)));
    EXPECT_EQ(ip, stored("ip"));
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenAddTest, AcceptsAnAddressOfAnyLength) {
  OAUTHDBToken tokens("oauth_token");
  const std::string ip = "fe80::1%" + times(5000, 'i');
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::ip, ip)));
  EXPECT_EQ(ip, stored("ip"));
}

TEST_F(TokenAddTest, StoresAnEmptyAddressAsEmpty) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::ip, "")));
  EXPECT_EQ("", stored("ip"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenAddTest, RefusesAnythingElseAsAnAddress) {
  OAUTHDBToken tokens("oauth_token");
  const std::string values[] = {"example",
                                "300.1.1.1",
                                "None",
                                "1.2.3",
                                "1.2.3.4.5",
                                " 192.0.2.7",
                                "192.0.2.7 ",
                                "192.0.2.7:80",
                                "192.0.2.7/24",
                                "192.0.2.7%1",
                                "[::1]",
                                "::1::",
                                "1:2:3:4:5:6:7:8:9",
                                "fe80::g",
                                "%",
                                "%lo",
                                "'",
                                std::string(1, '\0'),
                                std::string(1, '\0') + "192.0.2.7",
                                times(5000, '1'),
                                times(5000, ':') + "%1"};
  for (const std::string& ip : values) {
    SCOPED_TRACE(ip);
    recordEarlierError(tokens);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, add(tokens, grantWith(&Grant::ip, ip), result));
    expectEarlierError(tokens);
    EXPECT_EQ(Json::Value(), result);
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad IP address[Invalid argument]"));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad IP address[%s]"));
  }
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(TokenAddTest, NamesTheParseErrorWhateverErrnoSaidBefore) {
  OAUTHDBToken tokens("oauth_token");
  errno = ENOENT;
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::ip, "example")));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad IP address[Invalid argument]"));
}

TEST_F(TokenAddTest, FindsTheTableFullAtItsCeiling) {
  writeSettings(R"({"token_max": 2})");
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::access_token, times(64, '1'))));
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::access_token, times(64, '2'))));
  const Lines before = rows();

  Json::Value result;
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::access_token, times(64, '3')), result));
  expectError(tokens, kErrTableFull, "Token Table is full");
  EXPECT_EQ(Json::Value(), result);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Token Table is full"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Token Table is full"));
  EXPECT_EQ(before, rows());
}

TEST_F(TokenAddTest, ReadsTheCeilingAfreshEveryTime) {
  writeSettings(R"({"token_max": 1})");
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::access_token, times(64, '1'))));
  writeSettings(R"({"token_max": 2})");
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::access_token, times(64, '2'))));
}

TEST_F(TokenAddTest, ReportsAFullTableBeforeABadAddress) {
  writeSettings(R"({"token_max": 1})");
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::ip, "example")));
  expectError(tokens, kErrTableFull, "Token Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Token Table is full"));
}

TEST_F(TokenAddTest, ReportsAFullTableBeforeABadLength) {
  writeSettings(R"({"token_max": 1})");
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  EXPECT_EQ(0, add(tokens, grantWith(&Grant::username, "")));
  expectError(tokens, kErrTableFull, "Token Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Token Table is full"));
}

TEST_F(TokenAddTest, ReportsABadAddressBeforeABadLength) {
  OAUTHDBToken tokens("oauth_token");
  Grant grant = grantWith(&Grant::ip, "example");
  grant.username = "";
  EXPECT_EQ(0, add(tokens, grant));
  expectError(tokens, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad IP address[Invalid argument]"));
}

TEST_F(TokenAddTest, TakesATableItCannotCountForFull) {
  OAUTHDBToken tokens("oauth_token");
  execute("DROP TABLE oauth_token");
  EXPECT_EQ(0, add(tokens, Grant()));
  expectError(tokens, kErrTableFull, "Token Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: "
                                        "oauth_token][1]",
                                        "3 oauth_db_basic.cpp Get Row Count failed[oauth_token]",
                                        "3 oauth_db_basic.cpp Check Row Max failed[oauth_token]",
                                        "3 oauth_token.cpp Token Table is full"));
}

TEST_F(TokenAddTest, LeavesBothTokensInTheResultOfAFailedInsert) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  const Grant second = grantWith(&Grant::refresh_token, times(64, 'R'));
  Json::Value result;
  EXPECT_EQ(0, add(tokens, second, result));
  EXPECT_EQ(bothTokens(second), result);
  expectError(tokens, 19, "UNIQUE constraint failed: oauth_token.access_token");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![UNIQUE constraint failed: "
                          "oauth_token.access_token][19]",
                          "3 oauth_db_basic.cpp Add failed[oauth_token]"));
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(TokenAddTest, AllowsEqualRefreshTokens) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::access_token, times(64, 'b'))));
  EXPECT_EQ(2, rowCount("oauth_token"));
}

TEST_F(TokenAddTest, StoresNothingThatCannotBeEncrypted) {
  OAUTHDBToken tokens("oauth_token");
  host_.failEncrypt(1);
  Json::Value result;
  EXPECT_EQ(0, add(tokens, Grant(), result));
  EXPECT_EQ(bothTokens(Grant()), result);
  expectError(tokens, kErrCrypt, "Data Encrypt failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  EXPECT_THAT(rows(), IsEmpty());
}

// --- Add with tokens of its own ---

class TokenIssueTest : public TokenTest {};

TEST_F(TokenIssueTest, DrawsTwoDifferentTokens) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(1, issue(tokens, Grant(), result));
  EXPECT_THAT(result.getMemberNames(), ElementsAre("access_token", "refresh_token"));
  const std::string access_token = result["access_token"].asString();
  const std::string refresh_token = result["refresh_token"].asString();
  EXPECT_THAT(access_token, MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(refresh_token, MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(access_token, refresh_token);
}

TEST_F(TokenIssueTest, DrawsNewTokensEveryTime) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value first, second;
  EXPECT_EQ(1, issue(tokens, Grant(), first));
  EXPECT_EQ(1, issue(tokens, Grant(), second));
  EXPECT_NE(first["access_token"], second["access_token"]);
  EXPECT_NE(first["refresh_token"], second["refresh_token"]);
}

TEST_F(TokenIssueTest, StoresWhatItReturns) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(1, issue(tokens, Grant(), result));
  Grant expected;
  expected.access_token = result["access_token"].asString();
  expected.refresh_token = result["refresh_token"].asString();
  EXPECT_THAT(rows(), ElementsAre(row(expected)));
}

TEST_F(TokenIssueTest, SetsTheExpiryByTheSetting) {
  const std::pair<const char*, const char*> cases[] = {
      {R"({})", "1700000600"},
      {R"({"token_expired": 1})", "1700000001"},
      {R"({"token_expired": 0})", "1700000600"},
      {R"({"token_expired": 3600, "grantcode_expired": 5})", "1700003600"},
      {R"({"token_expired": 2147483647})", "3847483647"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const auto& [settings, expiry] : cases) {
    SCOPED_TRACE(settings);
    execute("DELETE FROM oauth_token");
    writeSettings(settings);
    Json::Value result;
    EXPECT_EQ(1, issue(tokens, Grant(), result));
    EXPECT_EQ(expiry, stored("expired_time"));
  }
}

TEST_F(TokenIssueTest, CountsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  clock_.set(2'147'483'647);
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(1, issue(tokens, Grant(), result));
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
  EXPECT_EQ(1, issue(tokens, Grant(), issued));
  EXPECT_EQ("2208989400", stored("expired_time"));
  EXPECT_EQ(1, tokens.Verify(issued["access_token"].asString(), who));
  EXPECT_EQ("alice", who["username"].asString());
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_EQ(1, rowCount("oauth_token"));
}

TEST_F(TokenIssueTest, ChecksTheCallersValues) {
  OAUTHDBToken tokens("oauth_token");
  for (const LengthRule& rule : kShortEditRules) {
    SCOPED_TRACE(rule.column);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, issue(tokens, grantWith(rule.member, times(rule.max + 1)), result));
    EXPECT_EQ(Json::Value(), result);
    expectError(tokens, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
  }
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(TokenIssueTest, RefusesABadAddress) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(0, issue(tokens, grantWith(&Grant::ip, "example"), result));
  EXPECT_EQ(Json::Value(), result);
  expectError(tokens, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad IP address[Invalid argument]"));
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(TokenIssueTest, LeavesItsTokensInTheResultOfAFailedInsert) {
  createDatabase();
  files_.openReadOnly();
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  EXPECT_EQ(0, issue(tokens, Grant(), result));
  EXPECT_THAT(result.getMemberNames(), ElementsAre("access_token", "refresh_token"));
  expectError(tokens, 8, "attempt to write a readonly database");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![attempt to "
                                        "write a readonly database][8]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_token]"));
}

// --- Edit ---

class TokenEditTest : public TokenTest {
 protected:
  TokenEditTest() {
    OAUTHDBToken tokens("oauth_token");
    add(tokens, Grant());
    changed_.username = "bob";
    changed_.client_id = times(64, 'd');
    changed_.scope = "write";
    changed_.expired_time = "1";
    changed_.flow_type = "password";
    changed_.state = "new";
  }
  Grant changed_;
};

TEST_F(TokenEditTest, ShortFormLeavesTheExpiry) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, shortEdit(tokens, 1, changed_));
  changed_.expired_time = Grant().expired_time;
  EXPECT_THAT(rows(), ElementsAre(row(changed_)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenEditTest, LongFormRewritesTheExpiryToo) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, longEdit(tokens, 1, changed_));
  EXPECT_THAT(rows(), ElementsAre(row(changed_)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenEditTest, SucceedsWithTheValuesOfBefore) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, shortEdit(tokens, 1, Grant()));
  EXPECT_EQ(1, longEdit(tokens, 1, Grant()));
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(TokenEditTest, ShortFormAcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(
      kShortEditRules,
      [](OAUTHDBToken& tokens, const Grant& grant) { return shortEdit(tokens, 1, grant); }, [] {});
}

TEST_F(TokenEditTest, LongFormAcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(
      kLongEditRules,
      [](OAUTHDBToken& tokens, const Grant& grant) { return longEdit(tokens, 1, grant); }, [] {});
}

TEST_F(TokenEditTest, ShortFormStopsAtTheFirstBadLength) {
  expectCheckOrder(kShortEditRules, [](OAUTHDBToken& tokens, const Grant& grant) {
    return shortEdit(tokens, 1, grant);
  });
}

TEST_F(TokenEditTest, LongFormStopsAtTheFirstBadLength) {
  expectCheckOrder(kLongEditRules, [](OAUTHDBToken& tokens, const Grant& grant) {
    return longEdit(tokens, 1, grant);
  });
}

TEST_F(TokenEditTest, ShortFormStoresASingleQuoteAsItIs) {
  const StoredValue values[] = {
      {&Grant::username, "username", "O'Hara", "O'Hara"},
      {&Grant::client_id, "client_id", times(63, 'c') + "'",
       FakeHost::sealed(times(63, 'c') + "'")},
      {&Grant::scope, "scope", "'", "'"},
      {&Grant::flow_type, "flow_type", "a'b", "a'b"},
      {&Grant::state, "state", "''", "''"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const StoredValue& value : values) {
    SCOPED_TRACE(value.column);
    EXPECT_EQ(1, shortEdit(tokens, 1, grantWith(value.member, value.given)));
    EXPECT_EQ(value.stored, stored(value.column));
  }
}

TEST_F(TokenEditTest, LongFormStoresASingleQuoteDoubledExceptInTheExpiry) {
  const StoredValue values[] = {
      {&Grant::username, "username", "O'Hara", "O''Hara"},
      {&Grant::client_id, "client_id", times(63, 'c') + "'",
       FakeHost::sealed(times(63, 'c') + "''")},
      {&Grant::scope, "scope", "'", "''"},
      {&Grant::expired_time, "expired_time", "17'00", "17'00"},
      {&Grant::flow_type, "flow_type", "a'b", "a''b"},
      {&Grant::state, "state", "''", "''''"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const StoredValue& value : values) {
    SCOPED_TRACE(value.column);
    EXPECT_EQ(1, longEdit(tokens, 1, grantWith(value.member, value.given)));
    EXPECT_EQ(value.stored, stored(value.column));
  }
}

TEST_F(TokenEditTest, EndsEveryQuotedValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  const StoredValue values[] = {
      {&Grant::username, "username", "al" + nul + "ice", "al"},
      {&Grant::client_id, "client_id", "c" + nul + times(62, 'x'), FakeHost::sealed("c")},
      {&Grant::scope, "scope", nul + "read", ""},
      {&Grant::flow_type, "flow_type", "co" + nul + "'de", "co"},
      {&Grant::state, "state", "xyz" + nul, "xyz"},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const StoredValue& value : values) {
    SCOPED_TRACE(value.column);
    EXPECT_EQ(1, longEdit(tokens, 1, Grant()));
    EXPECT_EQ(1, longEdit(tokens, 1, grantWith(value.member, value.given)));
    EXPECT_EQ(value.stored, stored(value.column));
  }
}

TEST_F(TokenEditTest, RefusesANulInAValueTakenAsGiven) {
  const std::string nul(1, '\0');
  OAUTHDBToken tokens("oauth_token");
  const Lines before = rows();
  const auto refused = [&](int result) {
    EXPECT_EQ(0, result);
    EXPECT_EQ(1, tokens.GetErrCode());
    EXPECT_THAT(
        log_.lines(),
        ElementsAre(testing::StartsWith("3 oauth_db_basic.cpp Run Command failed!![unrecognized "
                                        "token: \"'"),
                    "3 oauth_db_basic.cpp Edit failed[oauth_token]"));
    log_.clear();
  };
  log_.clear();
  refused(shortEdit(tokens, 1, grantWith(&Grant::username, "al" + nul + "ice")));
  refused(shortEdit(tokens, 1, grantWith(&Grant::scope, nul + "read")));
  refused(shortEdit(tokens, 1, grantWith(&Grant::flow_type, "co" + nul + "'de")));
  refused(shortEdit(tokens, 1, grantWith(&Grant::state, "xyz" + nul)));
  refused(longEdit(tokens, 1, grantWith(&Grant::expired_time, "17" + nul + "00")));
  EXPECT_EQ(0, shortEdit(tokens, 1, grantWith(&Grant::client_id, "c" + nul + times(62, 'x'))));
  expectError(tokens, -4, "Data Encrypt failed");
  EXPECT_EQ(before, rows());
}

TEST_F(TokenEditTest, KeepsStatementsInsideAValueAsText) {
  OAUTHDBToken tokens("oauth_token");
  const Grant hostile = grantWith(&Grant::state, "x' WHERE 1; DROP TABLE oauth_token; --");
  EXPECT_EQ(1, shortEdit(tokens, 1, hostile));
  EXPECT_THAT(rows(), ElementsAre(row(hostile)));
}

TEST_F(TokenEditTest, FailsWithoutSuchARow) {
  for (const auto edit : {shortEdit, longEdit})
    for (const long long id : {0LL, -1LL, 2LL, 4294967297LL}) {
      SCOPED_TRACE(id);
      OAUTHDBToken tokens("oauth_token");
      recordEarlierError(tokens);
      log_.clear();
      EXPECT_EQ(0, edit(tokens, id, changed_));
      expectEarlierError(tokens);
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Edit failed[oauth_token]"));
    }
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(TokenEditTest, RewritesNoOtherRow) {
  const Grant large = insertRow("4294967297");
  OAUTHDBToken tokens("oauth_token");
  changed_.access_token = large.access_token;
  EXPECT_EQ(1, longEdit(tokens, 4294967297LL, changed_));
  EXPECT_THAT(rows(), ElementsAre(row(Grant()), row(changed_, "4294967297")));
}

TEST_F(TokenEditTest, WritesNothingThatCannotBeEncrypted) {
  for (const auto edit : {shortEdit, longEdit}) {
    OAUTHDBToken tokens("oauth_token");
    log_.clear();
    host_.failEncrypt(1);
    EXPECT_EQ(0, edit(tokens, 1, changed_));
    expectError(tokens, kErrCrypt, "Data Encrypt failed");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  }
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(TokenEditTest, ReportsAFailedStatement) {
  files_.openReadOnly();
  for (const auto edit : {shortEdit, longEdit}) {
    OAUTHDBToken tokens("oauth_token");
    log_.clear();
    EXPECT_EQ(0, edit(tokens, 1, changed_));
    expectError(tokens, 8, "attempt to write a readonly database");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![attempt to "
                                          "write a readonly database][8]",
                                          "3 oauth_db_basic.cpp Edit failed[oauth_token]"));
  }
}

// --- Del, Revoke ---

int del(OAUTHDBToken& tokens, long long id) { return tokens.Del(id); }
int revoke(OAUTHDBToken& tokens, long long id) { return tokens.Revoke(id); }

class TokenDelTest : public TokenTest {};

TEST_F(TokenDelTest, RemovesOneRow) {
  for (const auto remove : {del, revoke}) {
    OAUTHDBToken tokens("oauth_token");
    recordEarlierError(tokens);
    execute("DELETE FROM oauth_token");
    insertRow("1");
    insertRow("2");
    EXPECT_EQ(1, remove(tokens, 1));
    EXPECT_THAT(ids(), ElementsAre("2"));
    expectEarlierError(tokens);
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

TEST_F(TokenDelTest, TellsIdsApartBeyond32Bits) {
  for (const auto remove : {del, revoke}) {
    OAUTHDBToken tokens("oauth_token");
    execute("DELETE FROM oauth_token");
    for (const char* const id :
         {"-1", "0", "1", "2147483648", "4294967296", "4294967297", "9223372036854775807"})
      insertRow(id);
    EXPECT_EQ(1, remove(tokens, 4294967297LL));
    EXPECT_EQ(1, remove(tokens, 9223372036854775807LL));
    EXPECT_EQ(1, remove(tokens, 2147483648LL));
    EXPECT_EQ(1, remove(tokens, 0));
    EXPECT_THAT(ids(), ElementsAre("-1", "1", "4294967296"));
  }
}

TEST_F(TokenDelTest, FailsWithoutSuchARow) {
  for (const auto remove : {del, revoke}) {
    OAUTHDBToken tokens("oauth_token");
    execute("DELETE FROM oauth_token");
    insertRow("1");
    recordEarlierError(tokens);
    log_.clear();
    EXPECT_EQ(0, remove(tokens, 4294967297LL));
    expectEarlierError(tokens);
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Delete failed[oauth_token]"));
    EXPECT_THAT(ids(), ElementsAre("1"));
  }
}

TEST_F(TokenDelTest, ReportsAFailedStatement) {
  createDatabase();
  insertRow("1");
  refuseDeletes("1");
  for (const auto remove : {del, revoke}) {
    OAUTHDBToken tokens("oauth_token");
    log_.clear();
    EXPECT_EQ(0, remove(tokens, 1));
    expectError(tokens, 19, "kept");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                                          "3 oauth_db_basic.cpp Delete failed[oauth_token]"));
    EXPECT_THAT(ids(), ElementsAre("1"));
  }
}

// --- Look-ups ---

class TokenGetTest : public TokenTest {
 protected:
  static Json::Value document(const Grant& grant, const std::string& id) {
    Json::Value result = bothTokens(grant);
    result["username"] = grant.username;
    result["client_id"] = grant.client_id;
    result["scope"] = grant.scope;
    result["expired_time"] = grant.expired_time;
    result["flow_type"] = grant.flow_type;
    result["state"] = grant.state;
    result["ip"] = grant.ip;
    result["id"] = id;
    return result;
  }
  static Json::Value list(const std::vector<Json::Value>& rows) {
    Json::Value result(Json::arrayValue);
    for (const Json::Value& row : rows) result.append(row);
    return result;
  }
};

TEST_F(TokenGetTest, FindsTheRowOfAnAccessToken) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1");
  const Grant second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithAccessToken(second.access_token, &rows));
  EXPECT_EQ(list({document(second, "2")}), rows);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenGetTest, FindsEveryRowOfARefreshToken) {
  OAUTHDBToken tokens("oauth_token");
  const Grant first = insertRow("1");
  const Grant second = insertRow("2");
  execute("UPDATE oauth_token SET refresh_token = 'other' WHERE id = 1");
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithRefreshToken(second.refresh_token, &rows));
  EXPECT_EQ(list({document(second, "2")}), rows);
  execute("UPDATE oauth_token SET refresh_token = '" + first.refresh_token + "'");
  EXPECT_EQ(1, tokens.GetWithRefreshToken(second.refresh_token, &rows));
  EXPECT_EQ(list({document(first, "1"), document(second, "2")}), rows);
}

TEST_F(TokenGetTest, FindsARowById) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1");
  for (const long long id : {2147483648LL, 4294967297LL, 9223372036854775807LL, -5LL}) {
    SCOPED_TRACE(id);
    const Grant grant = insertRow(std::to_string(id));
    Json::Value rows;
    EXPECT_EQ(1, tokens.Get(id, &rows));
    EXPECT_EQ(list({document(grant, std::to_string(id))}), rows);
  }
}

TEST_F(TokenGetTest, ReadsTheWholeTable) {
  OAUTHDBToken tokens("oauth_token");
  const Grant first = insertRow("1");
  const Grant second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, tokens.Get(&rows));
  EXPECT_EQ(list({document(first, "1"), document(second, "2")}), rows);
}

TEST_F(TokenGetTest, FindsExpiredRows) {
  OAUTHDBToken tokens("oauth_token");
  const Grant grant = insertRow("1", "1");
  const Json::Value expected = list({document(grant, "1")});
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithAccessToken(grant.access_token, &rows));
  EXPECT_EQ(expected, rows);
  EXPECT_EQ(1, tokens.GetWithRefreshToken(grant.refresh_token, &rows));
  EXPECT_EQ(expected, rows);
}

TEST_F(TokenGetTest, SucceedsWithoutARow) {
  OAUTHDBToken tokens("oauth_token");
  recordEarlierError(tokens);
  const Json::Value none(Json::arrayValue);
  Json::Value rows("before");
  EXPECT_EQ(1, tokens.GetWithAccessToken(times(64), &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, tokens.GetWithRefreshToken(times(64), &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, tokens.Get(1, &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, tokens.Get(&rows));
  EXPECT_EQ(none, rows);
  expectEarlierError(tokens);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenGetTest, AcceptsTokensOf64BytesOnly) {
  OAUTHDBToken tokens("oauth_token");
  const auto lookups = {&OAUTHDBToken::GetWithAccessToken, &OAUTHDBToken::GetWithRefreshToken};
  for (const auto lookup : lookups)
    for (const int length : {0, 63, 65, 100000}) {
      SCOPED_TRACE(length);
      recordEarlierError(tokens);
      log_.clear();
      Json::Value rows("before");
      EXPECT_EQ(0, (tokens.*lookup)(times(length), &rows));
      EXPECT_EQ(Json::Value("before"), rows);
      expectError(tokens, kErrBadParameters, "Bad parameters");
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
      EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
    }
}

TEST_F(TokenGetTest, FindsTokensWithAQuoteThatAddStored) {
  OAUTHDBToken tokens("oauth_token");
  Grant grant;
  grant.access_token = "'" + times(63, 'a');
  grant.refresh_token = times(63, 'r') + "'";
  EXPECT_EQ(1, add(tokens, grant));
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithAccessToken(grant.access_token, &rows));
  ASSERT_EQ(1U, rows.size());
  EXPECT_EQ("''" + times(63, 'a'), rows[0U]["access_token"].asString());
  EXPECT_EQ(1, tokens.GetWithRefreshToken(grant.refresh_token, &rows));
  ASSERT_EQ(1U, rows.size());
  EXPECT_EQ(times(63, 'r') + "''", rows[0U]["refresh_token"].asString());
}

TEST_F(TokenGetTest, DoesNotFindASingleStoredQuote) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1");
  execute("UPDATE oauth_token SET access_token = '''" + times(63, 'a') + "', refresh_token = '''" +
          times(63, 'r') + "'");
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithAccessToken("'" + times(63, 'a'), &rows));
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  EXPECT_EQ(1, tokens.GetWithRefreshToken("'" + times(63, 'r'), &rows));
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
}

TEST_F(TokenGetTest, TakesWildcardsLiterally) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1");
  for (const char wildcard : {'%', '_', '*', '?'}) {
    SCOPED_TRACE(wildcard);
    Json::Value rows;
    EXPECT_EQ(1, tokens.GetWithAccessToken(times(64, wildcard), &rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  }
}

TEST_F(TokenGetTest, EndsTheTokenAtItsFirstNul) {
  OAUTHDBToken tokens("oauth_token");
  Grant grant;
  grant.access_token[10] = '\0';
  EXPECT_EQ(1, add(tokens, grant));
  Json::Value rows;
  EXPECT_EQ(1, tokens.GetWithAccessToken(grant.access_token, &rows));
  ASSERT_EQ(1U, rows.size());
  EXPECT_EQ(times(10, 'a'), rows[0U]["access_token"].asString());
}

TEST_F(TokenGetTest, DeliversAClientIdThatCannotBeDecryptedAsStored) {
  OAUTHDBToken tokens("oauth_token");
  Grant grant = insertRow("1");
  execute("UPDATE oauth_token SET client_id = 'plain'");
  grant.client_id = "plain";
  Json::Value rows;
  EXPECT_EQ(1, tokens.Get(&rows));
  EXPECT_EQ(list({document(grant, "1")}), rows);
  expectError(tokens, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
}

TEST_F(TokenGetTest, ReportsAFailedRead) {
  OAUTHDBToken tokens("oauth_token");
  execute("DROP TABLE oauth_token");
  const std::function<int(Json::Value*)> reads[] = {
      [&](Json::Value* rows) { return tokens.GetWithAccessToken(times(64), rows); },
      [&](Json::Value* rows) { return tokens.GetWithRefreshToken(times(64), rows); },
      [&](Json::Value* rows) { return tokens.Get(1, rows); },
      [&](Json::Value* rows) { return tokens.Get(rows); },
  };
  for (const auto& read : reads) {
    recordEarlierError(tokens);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, read(&rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
    expectError(tokens, 1, "no such table: oauth_token");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                          "table: oauth_token][1]",
                                          "3 oauth_db_basic.cpp Get failed[oauth_token]"));
  }
}

// --- GetIndex ---

class TokenIndexTest : public TokenTest {};

TEST_F(TokenIndexTest, IsTheLow32BitsOfTheId) {
  const std::pair<const char*, int> cases[] = {
      {"1", 1},
      {"2147483647", 2147483647},
      {"2147483648", std::numeric_limits<int>::min()},
      {"4294967295", -1},
      {"4294967296", 0},
      {"4294967301", 5},
      {"9223372036854775807", -1},
      {"-7", -7},
  };
  OAUTHDBToken tokens("oauth_token");
  for (const auto& [id, index] : cases) {
    const Grant grant = insertRow(id);
    EXPECT_EQ(index, tokens.GetIndex(grant.access_token)) << id;
  }
}

TEST_F(TokenIndexTest, IsZeroForAnUnknownToken) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(0, tokens.GetIndex(times(64)));
  expectError(tokens, kErrNone, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenIndexTest, IsZeroForABadLength) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(0, tokens.GetIndex(times(63)));
  expectError(tokens, kErrBadParameters, "Bad parameters");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_token.cpp Bad parameters"));
}

TEST_F(TokenIndexTest, IsZeroAfterAFailedRead) {
  OAUTHDBToken tokens("oauth_token");
  execute("DROP TABLE oauth_token");
  EXPECT_EQ(0, tokens.GetIndex(times(64)));
  expectError(tokens, 1, "no such table: oauth_token");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_token][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_token]"));
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
  EXPECT_EQ(1, add(tokens, Grant()));
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
  EXPECT_EQ(1, add(tokens, Grant()));
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
  EXPECT_EQ(1, add(tokens, grantWith(&Grant::username, "O'Hara")));
  Json::Value result;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
  EXPECT_EQ("O''Hara", result["username"].asString());
}

TEST_F(TokenVerifyTest, AcceptsTheVerySecondOfExpiry) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  clock_.set(1'700'000'600);
  Json::Value result;
  EXPECT_EQ(1, tokens.Verify(times(64, 'a'), result));
}

TEST_F(TokenVerifyTest, RefusesTheSecondAfterExpiry) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, add(tokens, Grant()));
  recordEarlierError(tokens);
  clock_.set(1'700'000'601);
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64, 'a'), result));
  EXPECT_EQ(refusal(-3, "Access Token Expired"), result);
  expectEarlierError(tokens);
  EXPECT_THAT(log_.lines(), IsEmpty());
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
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
  execute("DROP TABLE oauth_token");
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(times(64), result));
  EXPECT_EQ(refusal(1, "no such table: oauth_token"), result);
  expectError(tokens, 1, "no such table: oauth_token");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_token][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_token]"));
}

struct Expiry {
  std::string text;
  bool valid;  // at 1700000000
};
const std::vector<Expiry> kExpiries{
    {"1700000000", true},
    {"1699999999", false},
    {"0001700000000", true},
    {"2147483648", true},
    {"4294967296", true},
    {"9223372036854775807", true},
    {"9223372036854775808", true},
    {"99999999999999999999", true},
    {times(128, '9'), true},
    {"0", false},
    {"-1", false},
    {"-1700000001", false},
    {"-9223372036854775809", false},
    {"-" + times(127, '9'), false},
    {"", false},
    {"-", false},
    {"None", false},
    {"never", false},
    {"1800000000x", false},
    {"0x7fffffff", false},
    {times(30, '9') + "x", false},
};

TEST_F(TokenVerifyTest, ComparesTheExpiryAsANumber) {
  OAUTHDBToken tokens("oauth_token");
  for (const Expiry& expiry : kExpiries) {
    SCOPED_TRACE("'" + expiry.text + "'");
    execute("DELETE FROM oauth_token");
    const Grant grant = insertRow("1", expiry.text);
    Json::Value result;
    EXPECT_EQ(expiry.valid ? 1 : 0, tokens.Verify(grant.access_token, result));
    EXPECT_EQ(!expiry.valid, result.isMember("err_code"));
  }
}

TEST_F(TokenVerifyTest, ComparesClocksBeforeTheEpochWithTheirSign) {
  OAUTHDBToken tokens("oauth_token");
  const Grant earlier = insertRow("1", "-11");
  const Grant later = insertRow("2", "-10");
  clock_.set(-10);
  Json::Value result;
  EXPECT_EQ(0, tokens.Verify(earlier.access_token, result));
  EXPECT_EQ(1, tokens.Verify(later.access_token, result));
}

// --- Purge ---

class TokenPurgeTest : public TokenTest {};

TEST_F(TokenPurgeTest, DeletesExactlyTheExpiredRows) {
  OAUTHDBToken tokens("oauth_token");
  recordEarlierError(tokens);
  insertRow("1", "1699999999");
  insertRow("2", "1700000000");
  insertRow("3", "1");
  insertRow("4", "1700000001");
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_THAT(ids(), ElementsAre("2", "4"));
  expectEarlierError(tokens);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenPurgeTest, SucceedsOnAnEmptyTable) {
  OAUTHDBToken tokens("oauth_token");
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TokenPurgeTest, ComparesTheExpiryAsANumber) {
  OAUTHDBToken tokens("oauth_token");
  for (const Expiry& expiry : kExpiries) {
    SCOPED_TRACE("'" + expiry.text + "'");
    execute("DELETE FROM oauth_token");
    insertRow("1", expiry.text);
    EXPECT_EQ(1, tokens.Purge());
    EXPECT_EQ(expiry.valid ? 1 : 0, rowCount("oauth_token"));
  }
}

TEST_F(TokenPurgeTest, ComparesClocksBeforeTheEpochWithTheirSign) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1", "-11");
  insertRow("2", "-10");
  insertRow("3", "0");
  clock_.set(-10);
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_THAT(ids(), ElementsAre("2", "3"));
}

TEST_F(TokenPurgeTest, TellsIdsApartBeyond32Bits) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1");
  insertRow("4294967297", "1");
  insertRow("9223372036854775807", "1");
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_THAT(ids(), ElementsAre("1"));
}

TEST_F(TokenPurgeTest, GoesOnAfterAFailedDelete) {
  OAUTHDBToken tokens("oauth_token");
  for (const char* const id : {"1", "2", "3"}) insertRow(id, "1");
  refuseDeletes("OLD.id = 2");
  EXPECT_EQ(0, tokens.Purge());
  EXPECT_THAT(ids(), ElementsAre("2"));
  expectError(tokens, 19, "kept");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                                        "3 oauth_db_basic.cpp Delete failed[oauth_token]"));
}

TEST_F(TokenPurgeTest, CountsAFailedReadAsSuccess) {
  OAUTHDBToken tokens("oauth_token");
  execute("DROP TABLE oauth_token");
  EXPECT_EQ(1, tokens.Purge());
  expectError(tokens, 1, "no such table: oauth_token");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_token][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_token]"));
}

TEST_F(TokenPurgeTest, DeletesNothingAfterAReadThatFailsHalfway) {
  OAUTHDBToken tokens("oauth_token");
  insertRow("1", "1");
  insertRow("2", "1");
  execute("ALTER TABLE oauth_token RENAME TO kept");
  execute(
      "CREATE VIEW oauth_token AS SELECT username, client_id, "
      "CASE id WHEN 2 THEN abs(-9223372036854775807 - 1) ELSE scope END AS scope, refresh_token, "
      "access_token, expired_time, flow_type, state, ip, id FROM kept");
  EXPECT_EQ(1, tokens.Purge());
  EXPECT_EQ(2, rowCount("kept"));
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![integer overflow][1]",
                          "3 oauth_db_basic.cpp Get failed[oauth_token]"));
}

// --- Diagnostics ---

class TokenTraceTest : public TokenTest {};

TEST_F(TokenTraceTest, IssuingTracesBothForms) {
  Json::Value result;
  const Lines lines =
      traced(15, [&](OAUTHDBToken& tokens) { EXPECT_EQ(1, issue(tokens, Grant(), result)); });
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
  const Lines lines = traced(8, [](OAUTHDBToken& tokens) { EXPECT_EQ(0, add(tokens, Grant{""})); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_token.cpp ==> Add", "3 oauth_db_basic.cpp ==> DBCheckRowMax",
                  "3 oauth_db_basic.cpp ==> DBGetRowCount", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_token;]",
                  "3 oauth_db_basic.cpp ==> TabCountCallback", "3 oauth_token.cpp Bad parameters"));
}

TEST_F(TokenTraceTest, ShortEditTracesEveryStep) {
  createDatabase();
  insertRow("1");
  const Lines lines =
      traced(15, [](OAUTHDBToken& tokens) { EXPECT_EQ(1, shortEdit(tokens, 1, Grant())); });
  EXPECT_THAT(
      lines, ElementsAre(
                 "3 oauth_token.cpp ==> Edit", "3 oauth_utils.cpp checkStrLen[alice]",
                 "3 oauth_utils.cpp checkStrLen[" + times(64, 'c') + "]",
                 "3 oauth_utils.cpp checkStrLen[read]", "3 oauth_utils.cpp checkStrLen[code]",
                 "3 oauth_utils.cpp checkStrLen[xyz]", "3 oauth_db_basic.cpp ==> DBEdit",
                 "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
                 "3 oauth_db_basic.cpp ==> GetUpdateParam", "3 oauth_db_basic.cpp ==> ConcateParam",
                 "3 oauth_db_basic.cpp ==> GetConditionParam",
                 "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                 "3 oauth_db_basic.cpp ==> DBCmdRun[UPDATE oauth_token SET client_id='sealed:" +
                     times(64, 'c') +
                     "', flow_type='code', scope='read', state='xyz', username='alice' "
                     "WHERE id='1';]",
                 "3 oauth_db_basic.cpp ClientInfo Edit success, changed[1]"));
}

TEST_F(TokenTraceTest, LongEditTracesItsName) {
  const Lines lines =
      traced(8, [](OAUTHDBToken& tokens) { EXPECT_EQ(0, longEdit(tokens, 1, Grant{""})); });
  EXPECT_THAT(lines, ElementsAre("3 oauth_token.cpp ==> Edit", "3 oauth_token.cpp Bad parameters"));
}

TEST_F(TokenTraceTest, RevokingTracesTheDeleteToo) {
  createDatabase();
  insertRow("4294967297");
  const Lines lines =
      traced(15, [](OAUTHDBToken& tokens) { EXPECT_EQ(1, tokens.Revoke(4294967297LL)); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_token.cpp ==> Revoke", "3 oauth_token.cpp ==> Del",
                  "3 oauth_db_basic.cpp ==> DBDel", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_token WHERE "
                  "id='4294967297';]",
                  "3 oauth_db_basic.cpp ClientInfo Delete success, changed[1]"));
}

TEST_F(TokenTraceTest, VerifyingTracesTheLookup) {
  createDatabase();
  const Grant grant = insertRow("1");
  const Lines lines = traced(15, [&](OAUTHDBToken& tokens) {
    Json::Value result;
    EXPECT_EQ(1, tokens.Verify(grant.access_token, result));
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

TEST_F(TokenTraceTest, PurgingTracesEveryDelete) {
  createDatabase();
  insertRow("1");
  insertRow("2", "1");
  const Lines lines = traced(8, [](OAUTHDBToken& tokens) { EXPECT_EQ(1, tokens.Purge()); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_token.cpp ==> Purge", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[BEGIN IMMEDIATE;]",
                  "3 oauth_token.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                  "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_token ;]",
                  "3 oauth_db_basic.cpp ==> TabGetCallback",
                  "3 oauth_db_basic.cpp ==> TabGetCallback", "3 oauth_token.cpp ==> Del",
                  "3 oauth_db_basic.cpp ==> DBDel", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_token WHERE id='2';]",
                  "3 oauth_db_basic.cpp ==> DBCmd", "3 oauth_db_basic.cpp ==> DBCmdRun[COMMIT;]"));
}

TEST_F(TokenTraceTest, LookupsTraceTheirNames) {
  const Lines lines = traced(8, [](OAUTHDBToken& tokens) {
    Json::Value rows;
    tokens.GetIndex("");
    tokens.GetWithRefreshToken("", &rows);
    tokens.Get(1, &rows);
  });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_token.cpp ==> GetIndex", "3 oauth_token.cpp ==> GetWithAccessToken",
                  "3 oauth_token.cpp Bad parameters", "3 oauth_token.cpp ==> GetWithRefreshToken",
                  "3 oauth_token.cpp Bad parameters", "3 oauth_token.cpp ==> Get",
                  "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_token WHERE id='1' ;]"));
}

// --- A store that could not be opened ---

class UnopenedTokenTest : public TokenTest {
 protected:
  UnopenedTokenTest() { files_.removeDirectory(); }

  void expectRefusal(int result, const Lines& lines,
                     const std::function<int(OAUTHDBToken&)>& operation, int code = kErrCreateTable,
                     const std::string& msg = "Create table failed") {
    OAUTHDBToken tokens("oauth_token");
    expectError(tokens, kErrCreateTable, "Create table failed");
    log_.clear();
    EXPECT_EQ(result, operation(tokens));
    EXPECT_THAT(log_.lines(), ElementsAreArray(lines));
    expectError(tokens, code, msg);
  }

  const Lines readRefused_{"3 oauth_db_basic.cpp DB is not ready!!",
                           "3 oauth_db_basic.cpp Get failed[oauth_token]"};
};

TEST_F(UnopenedTokenTest, RefusesToAdd) {
  for (const auto adding : {issue, add})
    expectRefusal(
        0,
        {"3 oauth_db_basic.cpp DB is not ready!!",
         "3 oauth_db_basic.cpp Get Row Count failed[oauth_token]",
         "3 oauth_db_basic.cpp Check Row Max failed[oauth_token]",
         "3 oauth_token.cpp Token Table is full"},
        [&](OAUTHDBToken& tokens) {
          Json::Value result;
          const int added = adding(tokens, Grant(), result);
          EXPECT_EQ(Json::Value(), result);
          return added;
        },
        kErrTableFull, "Token Table is full");
}

TEST_F(UnopenedTokenTest, RefusesToEdit) {
  for (const auto edit : {shortEdit, longEdit})
    expectRefusal(
        0,
        {"3 oauth_db_basic.cpp DB is not ready!!", "3 oauth_db_basic.cpp Edit failed[oauth_token]"},
        [&](OAUTHDBToken& tokens) { return edit(tokens, 1, Grant()); });
}

TEST_F(UnopenedTokenTest, RefusesToDelete) {
  for (const auto remove : {del, revoke})
    expectRefusal(0,
                  {"3 oauth_db_basic.cpp DB is not ready!!",
                   "3 oauth_db_basic.cpp Delete failed[oauth_token]"},
                  [&](OAUTHDBToken& tokens) { return remove(tokens, 1); });
}

TEST_F(UnopenedTokenTest, RefusesToRead) {
  Json::Value rows;
  expectRefusal(0, readRefused_, [&](OAUTHDBToken& tokens) { return tokens.Get(&rows); });
  expectRefusal(0, readRefused_, [&](OAUTHDBToken& tokens) { return tokens.Get(1, &rows); });
  expectRefusal(0, readRefused_,
                [&](OAUTHDBToken& tokens) { return tokens.GetWithAccessToken(times(64), &rows); });
  expectRefusal(0, readRefused_,
                [&](OAUTHDBToken& tokens) { return tokens.GetWithRefreshToken(times(64), &rows); });
}

TEST_F(UnopenedTokenTest, HasNoIndex) {
  expectRefusal(0, readRefused_, [](OAUTHDBToken& tokens) { return tokens.GetIndex(times(64)); });
}

TEST_F(UnopenedTokenTest, CountsAPurgeAsSuccess) {
  expectRefusal(1, readRefused_, [](OAUTHDBToken& tokens) { return tokens.Purge(); });
}

TEST_F(UnopenedTokenTest, VerifiesNothing) {
  Json::Value result;
  expectRefusal(0, readRefused_,
                [&](OAUTHDBToken& tokens) { return tokens.Verify(times(64), result); });
  Json::Value expected;
  expected["err_code"] = -1;
  expected["err_msg"] = "Create table failed";
  EXPECT_EQ(expected, result);
}

TEST_F(UnopenedTokenTest, StillChecksLengthsFirst) {
  expectRefusal(
      0, {"3 oauth_token.cpp Bad parameters"},
      [](OAUTHDBToken& tokens) { return shortEdit(tokens, 1, Grant{""}); }, kErrBadParameters,
      "Bad parameters");
}

}  // namespace
