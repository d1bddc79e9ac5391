#include "oauth_grantCode.h"

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
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;

namespace {

// Every column of a row but its id. The clock of the tests starts 600 seconds before its expiry.
struct Grant {
  std::string username = "alice";
  std::string client_id = times(64, 'c');
  std::string scope = "read";
  std::string code = times(64, 'a');
  std::string expired_time = "1700000600";
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
const LengthRule kCode{&Grant::code, "code", 64, 64};
const LengthRule kExpiredTime{&Grant::expired_time, "expired_time", 1, 128};
const LengthRule kState{&Grant::state, "state", 1, 2048};

// In the order in which each operation checks.
const std::vector<LengthRule> kAddRules{kUserName, kClientId, kScope, kCode, kExpiredTime, kState};
const std::vector<LengthRule> kShortEditRules{kUserName, kClientId, kScope, kState};
const std::vector<LengthRule> kLongEditRules{kUserName, kClientId, kScope, kExpiredTime, kState};

struct StoredValue {
  Member member;
  const char* column;
  std::string given, stored;
};

Json::Value codeAlone(const std::string& code) {
  Json::Value result;
  result["code"] = code;
  return result;
}

int add(OAUTHDBGrantCode& codes, const Grant& grant, Json::Value& result) {
  return codes.Add(grant.username, grant.client_id, grant.scope, grant.code, grant.expired_time,
                   grant.state, grant.ip, result);
}
int add(OAUTHDBGrantCode& codes, const Grant& grant) {
  Json::Value result;
  return add(codes, grant, result);
}
int issue(OAUTHDBGrantCode& codes, const Grant& grant, Json::Value& result) {
  return codes.Add(grant.username, grant.client_id, grant.scope, grant.state, grant.ip, result);
}
int shortEdit(OAUTHDBGrantCode& codes, long long id, const Grant& grant) {
  return codes.Edit(id, grant.username, grant.client_id, grant.scope, grant.state);
}
int longEdit(OAUTHDBGrantCode& codes, long long id, const Grant& grant) {
  return codes.Edit(id, grant.username, grant.client_id, grant.scope, grant.expired_time,
                    grant.state);
}

class GrantCodeTest : public StoreTest {
 protected:
  // A value with a NUL byte ended the statement inside a literal.
  void expectUnclosedLiteral(const std::string& failure) const {
    EXPECT_THAT(
        log_.lines(),
        ElementsAre(testing::StartsWith("3 oauth_db_basic.cpp Run Command failed!![unrecognized "
                                        "token: \"'"),
                    "3 oauth_db_basic.cpp " + failure));
  }
  static void createDatabase() { const OAUTHDBGrantCode codes("oauth_grantCode"); }

  // A row as query() prints it.
  static std::string row(const Grant& grant, const std::string& id = "1") {
    return grant.username + "|" + FakeHost::sealed(grant.client_id) + "|" + grant.scope + "|" +
           grant.code + "|" + grant.expired_time + "|" + grant.state + "|" + grant.ip + "|" + id;
  }
  Lines rows() const { return query("SELECT * FROM oauth_grantCode ORDER BY id"); }
  Lines ids() const { return query("SELECT id FROM oauth_grantCode ORDER BY id"); }
  std::string stored(const char* column) const {
    return query(std::string("SELECT ") + column + " FROM oauth_grantCode").at(0);
  }

  // Writes a row past the store, where no length rule holds. An id serves as the code's
  // beginning, so that codes differ.
  Grant insertRow(const std::string& id, const std::string& expired_time = "1700000600") const {
    Grant grant;
    grant.expired_time = expired_time;
    grant.code.replace(0, id.size(), id);
    execute("INSERT INTO oauth_grantCode VALUES('" + grant.username + "', '" +
            FakeHost::sealed(grant.client_id) + "', '" + grant.scope + "', '" + grant.code +
            "', '" + expired_time + "', '" + grant.state + "', '" + grant.ip + "', " + id + ")");
    return grant;
  }
  void refuseDeletes(const std::string& condition) const {
    execute("CREATE TRIGGER refusal BEFORE DELETE ON oauth_grantCode WHEN " + condition +
            " BEGIN SELECT RAISE(ABORT, 'kept'); END");
  }

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(OAUTHDBGrantCode&)>& body) {
    withDiagnostics(mask, [&] {
      OAUTHDBGrantCode codes("oauth_grantCode");
      log_.clear();
      body(codes);
    });
    return log_.lines();
  }

  using Operation = std::function<int(OAUTHDBGrantCode&, const Grant&)>;

  // Both bounds of every rule are accepted; one byte beyond either is refused, and only the log
  // tells why.
  void expectLengthRules(const std::vector<LengthRule>& rules, const Operation& operation,
                         const std::function<void()>& prepare) {
    OAUTHDBGrantCode codes("oauth_grantCode");
    for (const LengthRule& rule : rules)
      for (const int length : {rule.min - 1, rule.min, rule.max, rule.max + 1}) {
        SCOPED_TRACE(rule.column + std::string(" of ") + std::to_string(length) + " bytes");
        prepare();
        const Lines before = rows();
        recordEarlierError(codes);
        log_.clear();
        const int done = operation(codes, grantWith(rule.member, times(length, '1')));
        expectEarlierError(codes);
        if (length < rule.min || length > rule.max) {
          EXPECT_EQ(0, done);
          EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad parameters"));
          EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
          EXPECT_EQ(before, rows());
        } else {
          EXPECT_EQ(1, done);
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
      expected.emplace_back("3 oauth_grantCode.cpp Bad parameters");
      EXPECT_THAT(traced(4, [&](OAUTHDBGrantCode& codes) { operation(codes, bad); }),
                  ElementsAreArray(expected))
          << rule.column;
    }
  }

  void expectStored(const std::vector<StoredValue>& values, const Operation& operation,
                    const std::function<void()>& prepare) {
    OAUTHDBGrantCode codes("oauth_grantCode");
    for (const StoredValue& value : values) {
      SCOPED_TRACE(value.column);
      prepare();
      EXPECT_EQ(1, operation(codes, grantWith(value.member, value.given)));
      EXPECT_EQ(value.stored, stored(value.column));
    }
  }
};

// --- Add with the caller's code ---

class GrantCodeAddTest : public GrantCodeTest {
 protected:
  void emptyTable() const { execute("DELETE FROM oauth_grantCode"); }
};

TEST_F(GrantCodeAddTest, StoresEveryColumn) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, Grant()));
  EXPECT_THAT(rows(), ElementsAre("alice|sealed:" + times(64, 'c') + "|read|" + times(64, 'a') +
                                  "|1700000600|xyz|192.0.2.7|1"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeAddTest, ReturnsTheCodeAlone) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(1, add(codes, Grant(), result));
  EXPECT_EQ(codeAlone(times(64, 'a')), result);
}

TEST_F(GrantCodeAddTest, LeavesOtherKeysOfTheResult) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  result["code"] = "stale";
  result["other"] = "kept";
  EXPECT_EQ(1, add(codes, Grant(), result));
  Json::Value expected = codeAlone(times(64, 'a'));
  expected["other"] = "kept";
  EXPECT_EQ(expected, result);
}

TEST_F(GrantCodeAddTest, KeepsAnEarlierErrorOnSuccess) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  recordEarlierError(codes);
  EXPECT_EQ(1, add(codes, Grant()));
  expectEarlierError(codes);
}

TEST_F(GrantCodeAddTest, AcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(
      kAddRules, [](OAUTHDBGrantCode& codes, const Grant& grant) { return add(codes, grant); },
      [this] { emptyTable(); });
}

TEST_F(GrantCodeAddTest, StopsAtTheFirstBadLength) {
  expectCheckOrder(kAddRules,
                   [](OAUTHDBGrantCode& codes, const Grant& grant) { return add(codes, grant); });
}

TEST_F(GrantCodeAddTest, LeavesTheResultUntouchedAfterABadLength) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(0, add(codes, grantWith(&Grant::code, times(63)), result));
  EXPECT_EQ(Json::Value(), result);
}

TEST_F(GrantCodeAddTest, MeasuresLengthsInBytes) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  std::string username;
  for (int i = 0; i < 128; ++i) username += "\u00e9";
  EXPECT_EQ(1, add(codes, grantWith(&Grant::username, username)));
  EXPECT_EQ(username, stored("username"));
  emptyTable();
  EXPECT_EQ(0, add(codes, grantWith(&Grant::username, username + "\u00e9")));
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(GrantCodeAddTest, StoresASingleQuoteDoubledExceptInExpiryOrAddress) {
  expectStored(
      {
          {&Grant::username, "username", "O'Hara", "O''Hara"},
          {&Grant::client_id, "client_id", times(63, 'c') + "'",
           FakeHost::sealed(times(63, 'c') + "''")},
          {&Grant::scope, "scope", "'", "''"},
          {&Grant::code, "code", "'" + times(63, 'a'), "''" + times(63, 'a')},
          {&Grant::expired_time, "expired_time", "17'00", "17'00"},
          {&Grant::state, "state", "''", "''''"},
          {&Grant::ip, "ip", "fe80::1%a'b", "fe80::1%a'b"},
      },
      [](OAUTHDBGrantCode& codes, const Grant& grant) { return add(codes, grant); },
      [this] { emptyTable(); });
}

TEST_F(GrantCodeAddTest, ReturnsACodeWithItsQuotesAsGiven) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(1, add(codes, grantWith(&Grant::code, "'" + times(63)), result));
  EXPECT_EQ(codeAlone("'" + times(63)), result);
}

TEST_F(GrantCodeAddTest, KeepsStatementsInsideAValueAsText) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant hostile = grantWith(&Grant::expired_time, "x'); DROP TABLE oauth_grantCode; --");
  EXPECT_EQ(1, add(codes, hostile));
  EXPECT_THAT(rows(), ElementsAre(row(hostile)));
}

TEST_F(GrantCodeAddTest, EndsEveryQuotedValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  expectStored(
      {
          {&Grant::username, "username", "al" + nul + "ice", "al"},
          {&Grant::client_id, "client_id", "c" + nul + times(62, 'x'), FakeHost::sealed("c")},
          {&Grant::scope, "scope", nul + "read", ""},
          {&Grant::code, "code", "a" + nul + times(62, 'x'), "a"},
          {&Grant::state, "state", "xyz" + nul, "xyz"},
      },
      [](OAUTHDBGrantCode& codes, const Grant& grant) { return add(codes, grant); },
      [this] { emptyTable(); });
}

TEST_F(GrantCodeAddTest, RefusesANulInAValueTakenAsGiven) {
  const std::string nul(1, '\0');
  for (const Grant& grant : {grantWith(&Grant::expired_time, "17" + nul + "'00"),
                             grantWith(&Grant::ip, "192.0.2.7" + nul + "'")}) {
    OAUTHDBGrantCode codes("oauth_grantCode");
    log_.clear();
    EXPECT_EQ(0, add(codes, grant));
    EXPECT_EQ(1, codes.GetErrCode());
    expectUnclosedLiteral("Add failed[oauth_grantCode]");
    EXPECT_EQ(0, rowCount("oauth_grantCode"));
  }
}

TEST_F(GrantCodeAddTest, AcceptsAddressesOfBothFamilies) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const std::string ip :
       {"192.168.1.20", "0.0.0.0", "255.255.255.255", "::", "::1", "2001:DB8::7",
        "::ffff:192.0.2.7", "fe80::1%1", "fe80::1%lo", "2001:db8::7%4294967295", "::1%\x1b[2J"}) {
    SCOPED_TRACE(ip);
    emptyTable();
    EXPECT_EQ(1, add(codes, grantWith(&Grant::ip, ip)));
    EXPECT_EQ(ip, stored("ip"));
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeAddTest, StoresAnEmptyAddressAsEmpty) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, grantWith(&Grant::ip, "")));
  EXPECT_EQ("", stored("ip"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeAddTest, RefusesAnythingElseAsAnAddress) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const std::string& ip :
       {std::string("None"), std::string("example"), std::string("300.1.1.1"),
        std::string("192.0.2.7 "), std::string("192.0.2.7:80"), std::string("[::1]"),
        std::string("'"), std::string(1, '\0'), times(5000, '1')}) {
    SCOPED_TRACE(ip);
    recordEarlierError(codes);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, add(codes, grantWith(&Grant::ip, ip), result));
    expectEarlierError(codes);
    EXPECT_EQ(Json::Value(), result);
    EXPECT_THAT(log_.lines(),
                ElementsAre("3 oauth_grantCode.cpp Bad IP address[Invalid argument]"));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad IP address[%s]"));
  }
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(GrantCodeAddTest, NamesTheParseErrorWhateverErrnoSaidBefore) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  errno = ENOENT;
  EXPECT_EQ(0, add(codes, grantWith(&Grant::ip, "example")));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad IP address[Invalid argument]"));
}

TEST_F(GrantCodeAddTest, FindsTheTableFullAtItsCeiling) {
  writeSettings(R"({"grantcode_max": 2})");
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, grantWith(&Grant::code, times(64, '1'))));
  EXPECT_EQ(1, add(codes, grantWith(&Grant::code, times(64, '2'))));
  const Lines before = rows();

  Json::Value result;
  EXPECT_EQ(0, add(codes, grantWith(&Grant::code, times(64, '3')), result));
  expectError(codes, kErrTableFull, "GrantCode Table is full");
  EXPECT_EQ(Json::Value(), result);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp GrantCode Table is full"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d GrantCode Table is full"));
  EXPECT_EQ(before, rows());
}

TEST_F(GrantCodeAddTest, ReportsAFullTableBeforeABadAddress) {
  writeSettings(R"({"grantcode_max": 1})");
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, Grant()));
  EXPECT_EQ(0, add(codes, grantWith(&Grant::ip, "example")));
  expectError(codes, kErrTableFull, "GrantCode Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp GrantCode Table is full"));
}

TEST_F(GrantCodeAddTest, ReportsAFullTableBeforeABadLength) {
  writeSettings(R"({"grantcode_max": 1})");
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, Grant()));
  EXPECT_EQ(0, add(codes, grantWith(&Grant::username, "")));
  expectError(codes, kErrTableFull, "GrantCode Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp GrantCode Table is full"));
}

TEST_F(GrantCodeAddTest, ReportsABadAddressBeforeABadLength) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Grant grant = grantWith(&Grant::ip, "example");
  grant.username = "";
  EXPECT_EQ(0, add(codes, grant));
  expectError(codes, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad IP address[Invalid argument]"));
}

TEST_F(GrantCodeAddTest, TakesATableItCannotCountForFull) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  execute("DROP TABLE oauth_grantCode");
  EXPECT_EQ(0, add(codes, Grant()));
  expectError(codes, kErrTableFull, "GrantCode Table is full");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: "
                          "oauth_grantCode][1]",
                          "3 oauth_db_basic.cpp Get Row Count failed[oauth_grantCode]",
                          "3 oauth_db_basic.cpp Check Row Max failed[oauth_grantCode]",
                          "3 oauth_grantCode.cpp GrantCode Table is full"));
}

TEST_F(GrantCodeAddTest, LeavesTheCodeInTheResultOfAFailedInsert) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, Grant()));
  Json::Value result;
  EXPECT_EQ(0, add(codes, Grant(), result));
  EXPECT_EQ(codeAlone(times(64, 'a')), result);
  expectError(codes, 19, "UNIQUE constraint failed: oauth_grantCode.code");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![UNIQUE constraint failed: "
                          "oauth_grantCode.code][19]",
                          "3 oauth_db_basic.cpp Add failed[oauth_grantCode]"));
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(GrantCodeAddTest, StoresNothingThatCannotBeEncrypted) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  host_.failEncrypt(1);
  Json::Value result;
  EXPECT_EQ(0, add(codes, Grant(), result));
  EXPECT_EQ(codeAlone(times(64, 'a')), result);
  expectError(codes, kErrCrypt, "Data Encrypt failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  EXPECT_THAT(rows(), IsEmpty());
}

// --- Add with a code of its own ---

class GrantCodeIssueTest : public GrantCodeTest {};

TEST_F(GrantCodeIssueTest, ReturnsAFreshCodeEveryTime) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value first, second;
  EXPECT_EQ(1, issue(codes, Grant(), first));
  EXPECT_EQ(1, issue(codes, Grant(), second));
  EXPECT_THAT(first.getMemberNames(), ElementsAre("code"));
  EXPECT_THAT(first["code"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(second["code"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(first["code"], second["code"]);
}

TEST_F(GrantCodeIssueTest, StoresWhatItReturns) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(1, issue(codes, Grant(), result));
  EXPECT_THAT(rows(), ElementsAre(row(grantWith(&Grant::code, result["code"].asString()))));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeIssueTest, SetsTheExpiryByTheSetting) {
  const std::pair<const char*, const char*> cases[] = {
      {R"({})", "1700000600"},
      {R"({"grantcode_expired": 1})", "1700000001"},
      {R"({"grantcode_expired": -5})", "1700000600"},
      {R"({"grantcode_expired": 3600, "token_expired": 5})", "1700003600"},
      {R"({"grantcode_expired": 2147483647})", "3847483647"},
  };
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const auto& [settings, expiry] : cases) {
    SCOPED_TRACE(settings);
    execute("DELETE FROM oauth_grantCode");
    writeSettings(settings);
    Json::Value result;
    EXPECT_EQ(1, issue(codes, Grant(), result));
    EXPECT_EQ(expiry, stored("expired_time"));
  }
}

TEST_F(GrantCodeIssueTest, CountsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  clock_.set(4'294'967'296);
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(1, issue(codes, Grant(), result));
  EXPECT_EQ("4294967896", stored("expired_time"));
  clock_.set(4'294'967'896);
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(1, rowCount("oauth_grantCode"));
  clock_.set(4'294'967'897);
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
}

TEST_F(GrantCodeIssueTest, ChecksTheCallersValues) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const LengthRule& rule : kShortEditRules) {
    SCOPED_TRACE(rule.column);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, issue(codes, grantWith(rule.member, times(rule.max + 1)), result));
    EXPECT_EQ(Json::Value(), result);
    expectError(codes, kErrNone, "");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad parameters"));
  }
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(GrantCodeIssueTest, RefusesABadAddress) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(0, issue(codes, grantWith(&Grant::ip, "example"), result));
  EXPECT_EQ(Json::Value(), result);
  expectError(codes, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad IP address[Invalid argument]"));
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(GrantCodeIssueTest, LeavesItsCodeInTheResultOfAFailedInsert) {
  createDatabase();
  files_.openReadOnly();
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value result;
  EXPECT_EQ(0, issue(codes, Grant(), result));
  EXPECT_THAT(result.getMemberNames(), ElementsAre("code"));
  expectError(codes, 8, "attempt to write a readonly database");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![attempt to "
                                        "write a readonly database][8]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_grantCode]"));
}

// --- Edit ---

class GrantCodeEditTest : public GrantCodeTest {
 protected:
  GrantCodeEditTest() {
    OAUTHDBGrantCode codes("oauth_grantCode");
    add(codes, Grant());
    changed_.username = "bob";
    changed_.client_id = times(64, 'd');
    changed_.scope = "write";
    changed_.expired_time = "1";
    changed_.state = "new";
  }
  static int shortEditOfFirst(OAUTHDBGrantCode& codes, const Grant& grant) {
    return shortEdit(codes, 1, grant);
  }
  static int longEditOfFirst(OAUTHDBGrantCode& codes, const Grant& grant) {
    return longEdit(codes, 1, grant);
  }
  void restoreRow() const {
    execute("DELETE FROM oauth_grantCode");
    OAUTHDBGrantCode codes("oauth_grantCode");
    add(codes, Grant());
  }
  Grant changed_;
};

TEST_F(GrantCodeEditTest, ShortFormLeavesTheExpiry) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, shortEdit(codes, 1, changed_));
  changed_.expired_time = Grant().expired_time;
  EXPECT_THAT(rows(), ElementsAre(row(changed_)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeEditTest, LongFormRewritesTheExpiryToo) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, longEdit(codes, 1, changed_));
  EXPECT_THAT(rows(), ElementsAre(row(changed_)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeEditTest, ShortFormAcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(kShortEditRules, shortEditOfFirst, [] {});
}

TEST_F(GrantCodeEditTest, LongFormAcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(kLongEditRules, longEditOfFirst, [] {});
}

TEST_F(GrantCodeEditTest, ShortFormStopsAtTheFirstBadLength) {
  expectCheckOrder(kShortEditRules, shortEditOfFirst);
}

TEST_F(GrantCodeEditTest, LongFormStopsAtTheFirstBadLength) {
  expectCheckOrder(kLongEditRules, longEditOfFirst);
}

TEST_F(GrantCodeEditTest, ShortFormStoresASingleQuoteAsItIs) {
  expectStored(
      {
          {&Grant::username, "username", "O'Hara", "O'Hara"},
          {&Grant::client_id, "client_id", times(63, 'c') + "'",
           FakeHost::sealed(times(63, 'c') + "'")},
          {&Grant::scope, "scope", "'", "'"},
          {&Grant::state, "state", "''", "''"},
      },
      shortEditOfFirst, [this] { restoreRow(); });
}

TEST_F(GrantCodeEditTest, LongFormStoresASingleQuoteDoubledExceptInTheExpiry) {
  expectStored(
      {
          {&Grant::username, "username", "O'Hara", "O''Hara"},
          {&Grant::client_id, "client_id", times(63, 'c') + "'",
           FakeHost::sealed(times(63, 'c') + "''")},
          {&Grant::scope, "scope", "'", "''"},
          {&Grant::expired_time, "expired_time", "17'00", "17'00"},
          {&Grant::state, "state", "''", "''''"},
      },
      longEditOfFirst, [this] { restoreRow(); });
}

TEST_F(GrantCodeEditTest, EndsEveryQuotedValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  const std::vector<StoredValue> values = {
      {&Grant::username, "username", "al" + nul + "ice", "al"},
      {&Grant::client_id, "client_id", "c" + nul + times(62, 'x'), FakeHost::sealed("c")},
      {&Grant::scope, "scope", nul + "read", ""},
      {&Grant::state, "state", "xyz" + nul + "'", "xyz"},
  };
  expectStored(values, longEditOfFirst, [this] { restoreRow(); });
}

TEST_F(GrantCodeEditTest, RefusesANulInAValueTakenAsGiven) {
  const std::string nul(1, '\0');
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Lines before = rows();
  for (const Grant& grant :
       {grantWith(&Grant::username, "al" + nul + "ice"), grantWith(&Grant::scope, nul + "read"),
        grantWith(&Grant::state, "xyz" + nul + "'")}) {
    log_.clear();
    EXPECT_EQ(0, shortEdit(codes, 1, grant));
    EXPECT_EQ(1, codes.GetErrCode());
    expectUnclosedLiteral("Edit failed[oauth_grantCode]");
  }
  log_.clear();
  EXPECT_EQ(0, longEdit(codes, 1, grantWith(&Grant::expired_time, "17" + nul + "'00")));
  expectUnclosedLiteral("Edit failed[oauth_grantCode]");
  EXPECT_EQ(0, shortEdit(codes, 1, grantWith(&Grant::client_id, "c" + nul + times(62, 'x'))));
  expectError(codes, -4, "Data Encrypt failed");
  EXPECT_EQ(before, rows());
}

TEST_F(GrantCodeEditTest, KeepsStatementsInsideAValueAsText) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant hostile = grantWith(&Grant::state, "x' WHERE 1; DROP TABLE oauth_grantCode; --");
  EXPECT_EQ(1, shortEdit(codes, 1, hostile));
  EXPECT_THAT(rows(), ElementsAre(row(hostile)));
}

TEST_F(GrantCodeEditTest, FailsWithoutSuchARow) {
  for (const auto edit : {shortEdit, longEdit})
    for (const long long id : {0LL, -1LL, 2LL, 4294967297LL}) {
      SCOPED_TRACE(id);
      OAUTHDBGrantCode codes("oauth_grantCode");
      recordEarlierError(codes);
      log_.clear();
      EXPECT_EQ(0, edit(codes, id, changed_));
      expectEarlierError(codes);
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Edit failed[oauth_grantCode]"));
    }
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

TEST_F(GrantCodeEditTest, RewritesNoOtherRow) {
  const Grant large = insertRow("4294967297");
  OAUTHDBGrantCode codes("oauth_grantCode");
  changed_.code = large.code;
  EXPECT_EQ(1, longEdit(codes, 4294967297LL, changed_));
  EXPECT_THAT(rows(), ElementsAre(row(Grant()), row(changed_, "4294967297")));
}

TEST_F(GrantCodeEditTest, WritesNothingThatCannotBeEncrypted) {
  for (const auto edit : {shortEdit, longEdit}) {
    OAUTHDBGrantCode codes("oauth_grantCode");
    log_.clear();
    host_.failEncrypt(1);
    EXPECT_EQ(0, edit(codes, 1, changed_));
    expectError(codes, kErrCrypt, "Data Encrypt failed");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  }
  EXPECT_THAT(rows(), ElementsAre(row(Grant())));
}

// --- Del ---

class GrantCodeDelTest : public GrantCodeTest {};

TEST_F(GrantCodeDelTest, RemovesOneRow) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const char* const id : {"1", "2147483648", "4294967296", "4294967297"}) insertRow(id);
  recordEarlierError(codes);
  EXPECT_EQ(1, codes.Del(4294967297LL));
  EXPECT_EQ(1, codes.Del(2147483648LL));
  EXPECT_THAT(ids(), ElementsAre("1", "4294967296"));
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeDelTest, FailsWithoutSuchARow) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  recordEarlierError(codes);
  EXPECT_EQ(0, codes.Del(4294967297LL));
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Delete failed[oauth_grantCode]"));
  EXPECT_THAT(ids(), ElementsAre("1"));
}

TEST_F(GrantCodeDelTest, ReportsAFailedStatement) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  refuseDeletes("1");
  EXPECT_EQ(0, codes.Del(1));
  expectError(codes, 19, "kept");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                                        "3 oauth_db_basic.cpp Delete failed[oauth_grantCode]"));
  EXPECT_THAT(ids(), ElementsAre("1"));
}

// --- Look-ups ---

class GrantCodeGetTest : public GrantCodeTest {
 protected:
  static Json::Value document(const Grant& grant, const std::string& id) {
    Json::Value result = codeAlone(grant.code);
    result["username"] = grant.username;
    result["client_id"] = grant.client_id;
    result["scope"] = grant.scope;
    result["expired_time"] = grant.expired_time;
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

TEST_F(GrantCodeGetTest, FindsTheRowOfACode) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  const Grant second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, codes.Get(second.code, &rows));
  EXPECT_EQ(list({document(second, "2")}), rows);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeGetTest, FindsARowById) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  for (const long long id : {2147483648LL, 4294967297LL, 9223372036854775807LL, -5LL}) {
    SCOPED_TRACE(id);
    const Grant grant = insertRow(std::to_string(id));
    Json::Value rows;
    EXPECT_EQ(1, codes.Get(id, &rows));
    EXPECT_EQ(list({document(grant, std::to_string(id))}), rows);
  }
}

TEST_F(GrantCodeGetTest, ReadsTheWholeTable) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant first = insertRow("1");
  const Grant second = insertRow("2", "1");
  Json::Value rows;
  EXPECT_EQ(1, codes.Get(&rows));
  EXPECT_EQ(list({document(first, "1"), document(second, "2")}), rows);
}

TEST_F(GrantCodeGetTest, FindsExpiredCodes) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant grant = insertRow("1", "1");
  Json::Value rows;
  EXPECT_EQ(1, codes.Get(grant.code, &rows));
  EXPECT_EQ(list({document(grant, "1")}), rows);
}

TEST_F(GrantCodeGetTest, SucceedsWithoutARow) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  recordEarlierError(codes);
  const Json::Value none(Json::arrayValue);
  Json::Value rows("before");
  EXPECT_EQ(1, codes.Get(times(64), &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, codes.Get(1, &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, codes.Get(&rows));
  EXPECT_EQ(none, rows);
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeGetTest, AcceptsCodesOf64BytesOnly) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const int length : {0, 63, 65, 100000}) {
    SCOPED_TRACE(length);
    recordEarlierError(codes);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, codes.Get(times(length), &rows));
    EXPECT_EQ(Json::Value("before"), rows);
    expectError(codes, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad parameters"));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
  }
}

TEST_F(GrantCodeGetTest, DoesNotFindACodeWithAQuoteThatAddStored) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, add(codes, grantWith(&Grant::code, "'" + times(63))));
  Json::Value rows;
  EXPECT_EQ(1, codes.Get("'" + times(63), &rows));
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
}

TEST_F(GrantCodeGetTest, FindsASingleStoredQuote) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Grant grant = insertRow("1");
  execute("UPDATE oauth_grantCode SET code = '''" + times(63) + "'");
  grant.code = "'" + times(63);
  Json::Value rows;
  EXPECT_EQ(1, codes.Get(grant.code, &rows));
  EXPECT_EQ(list({document(grant, "1")}), rows);
}

TEST_F(GrantCodeGetTest, TakesWildcardsLiterally) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  for (const char wildcard : {'%', '_', '*', '?'}) {
    SCOPED_TRACE(wildcard);
    Json::Value rows;
    EXPECT_EQ(1, codes.Get(times(64, wildcard), &rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  }
}

TEST_F(GrantCodeGetTest, RefusesACodeWithANul) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Grant grant;
  grant.code[10] = '\0';
  EXPECT_EQ(1, add(codes, grant));
  Json::Value rows;
  EXPECT_EQ(0, codes.Get(grant.code, &rows));
  EXPECT_EQ(1, codes.GetErrCode());
  expectUnclosedLiteral("Get failed[oauth_grantCode]");
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
}

TEST_F(GrantCodeGetTest, ReportsAFailedRead) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  execute("DROP TABLE oauth_grantCode");
  const std::function<int(Json::Value*)> reads[] = {
      [&](Json::Value* rows) { return codes.Get(times(64), rows); },
      [&](Json::Value* rows) { return codes.Get(1, rows); },
      [&](Json::Value* rows) { return codes.Get(rows); },
  };
  for (const auto& read : reads) {
    recordEarlierError(codes);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, read(&rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
    expectError(codes, 1, "no such table: oauth_grantCode");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                          "table: oauth_grantCode][1]",
                                          "3 oauth_db_basic.cpp Get failed[oauth_grantCode]"));
  }
}

// --- GetIndex ---

class GrantCodeIndexTest : public GrantCodeTest {};

TEST_F(GrantCodeIndexTest, IsTheLow32BitsOfTheId) {
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
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const auto& [id, index] : cases) {
    const Grant grant = insertRow(id);
    EXPECT_EQ(index, codes.GetIndex(grant.code)) << id;
  }
}

TEST_F(GrantCodeIndexTest, IsZeroForAnUnknownCode) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(0, codes.GetIndex(times(64)));
  expectError(codes, kErrNone, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeIndexTest, IsZeroForABadLength) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(0, codes.GetIndex(times(63)));
  expectError(codes, kErrBadParameters, "Bad parameters");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_grantCode.cpp Bad parameters"));
}

TEST_F(GrantCodeIndexTest, IsZeroAfterAFailedRead) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  execute("DROP TABLE oauth_grantCode");
  EXPECT_EQ(0, codes.GetIndex(times(64)));
  expectError(codes, 1, "no such table: oauth_grantCode");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_grantCode][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_grantCode]"));
}

// --- Revoke ---

class GrantCodeRevokeTest : public GrantCodeTest {};

TEST_F(GrantCodeRevokeTest, SetsTheExpiryToNowAlone) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant first = insertRow("1");
  Grant second = insertRow("4294967297");
  recordEarlierError(codes);
  EXPECT_EQ(1, codes.Revoke(4294967297LL));
  second.expired_time = "1700000000";
  EXPECT_THAT(rows(), ElementsAre(row(first), row(second, "4294967297")));
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodeRevokeTest, ProlongsACodeThatExpiredBefore) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1", "5");
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ("1700000000", stored("expired_time"));
}

TEST_F(GrantCodeRevokeTest, KeepsTheRowForTheRestOfTheSecond) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(1, rowCount("oauth_grantCode"));
  clock_.advance(1);
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
}

TEST_F(GrantCodeRevokeTest, WritesMomentsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  clock_.set(4'294'967'297);
  EXPECT_EQ(1, codes.Revoke(1));
  EXPECT_EQ("4294967297", stored("expired_time"));
}

TEST_F(GrantCodeRevokeTest, FailsWithoutSuchARow) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  const Grant grant = insertRow("1");
  recordEarlierError(codes);
  EXPECT_EQ(0, codes.Revoke(4294967297LL));
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Edit failed[oauth_grantCode]"));
  EXPECT_THAT(rows(), ElementsAre(row(grant)));
}

// --- Purge ---

class GrantCodePurgeTest : public GrantCodeTest {};

TEST_F(GrantCodePurgeTest, DeletesExactlyTheExpiredRows) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  recordEarlierError(codes);
  insertRow("1", "1699999999");
  insertRow("2", "1700000000");
  insertRow("3", "1");
  insertRow("4", "1700000001");
  EXPECT_EQ(1, codes.Purge());
  EXPECT_THAT(ids(), ElementsAre("2", "4"));
  expectEarlierError(codes);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodePurgeTest, SucceedsOnAnEmptyTable) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_EQ(1, codes.Purge());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(GrantCodePurgeTest, ComparesTheExpiryAsANumber) {
  const std::pair<std::string, int> cases[] = {
      {"1700000000", 1},
      {"1699999999", 0},
      {"0001700000000", 1},
      {"4294967296", 1},
      {"9223372036854775807", 1},
      {"9223372036854775808", 1},
      {times(128, '9'), 1},
      {"0", 0},
      {"-1700000001", 0},
      {"-9223372036854775809", 0},
      {"", 0},
      {"-", 0},
      {"never", 0},
      {"1800000000x", 0},
  };
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const auto& [text, left] : cases) {
    SCOPED_TRACE("'" + text + "'");
    execute("DELETE FROM oauth_grantCode");
    insertRow("1", text);
    EXPECT_EQ(1, codes.Purge());
    EXPECT_EQ(left, rowCount("oauth_grantCode"));
  }
}

TEST_F(GrantCodePurgeTest, ComparesClocksBeforeTheEpochWithTheirSign) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1", "-11");
  insertRow("2", "-10");
  insertRow("3", "0");
  clock_.set(-10);
  EXPECT_EQ(1, codes.Purge());
  EXPECT_THAT(ids(), ElementsAre("2", "3"));
}

TEST_F(GrantCodePurgeTest, TellsIdsApartBeyond32Bits) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1");
  insertRow("4294967297", "1");
  insertRow("9223372036854775807", "1");
  EXPECT_EQ(1, codes.Purge());
  EXPECT_THAT(ids(), ElementsAre("1"));
}

TEST_F(GrantCodePurgeTest, GoesOnAfterAFailedDelete) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  for (const char* const id : {"1", "2", "3"}) insertRow(id, "1");
  refuseDeletes("OLD.id = 1");
  EXPECT_EQ(0, codes.Purge());
  EXPECT_THAT(ids(), ElementsAre("1"));
  expectError(codes, 19, "kept");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                                        "3 oauth_db_basic.cpp Delete failed[oauth_grantCode]"));
}

TEST_F(GrantCodePurgeTest, CountsAFailedReadAsSuccess) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  execute("DROP TABLE oauth_grantCode");
  EXPECT_EQ(1, codes.Purge());
  expectError(codes, 1, "no such table: oauth_grantCode");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_grantCode][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_grantCode]"));
}

TEST_F(GrantCodePurgeTest, DeletesNothingAfterAReadThatFailsHalfway) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  insertRow("1", "1");
  insertRow("2", "1");
  execute("ALTER TABLE oauth_grantCode RENAME TO kept");
  execute(
      "CREATE VIEW oauth_grantCode AS SELECT username, client_id, "
      "CASE id WHEN 2 THEN abs(-9223372036854775807 - 1) ELSE scope END AS scope, code, "
      "expired_time, state, ip, id FROM kept");
  EXPECT_EQ(1, codes.Purge());
  EXPECT_EQ(2, rowCount("kept"));
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![integer overflow][1]",
                          "3 oauth_db_basic.cpp Get failed[oauth_grantCode]"));
}

// --- Diagnostics ---

class GrantCodeTraceTest : public GrantCodeTest {};

TEST_F(GrantCodeTraceTest, IssuingTracesTheFullFormOnly) {
  Json::Value result;
  const Lines lines =
      traced(15, [&](OAUTHDBGrantCode& codes) { EXPECT_EQ(1, issue(codes, Grant(), result)); });
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

TEST_F(GrantCodeTraceTest, ShortEditHasNoTraceOfItsOwn) {
  createDatabase();
  insertRow("1");
  const Lines lines =
      traced(9, [](OAUTHDBGrantCode& codes) { EXPECT_EQ(0, shortEdit(codes, 1, Grant{""})); });
  EXPECT_THAT(lines, ElementsAre("3 oauth_grantCode.cpp Bad parameters"));
}

TEST_F(GrantCodeTraceTest, LongEditTracesEveryStep) {
  createDatabase();
  insertRow("1");
  const Lines lines =
      traced(15, [](OAUTHDBGrantCode& codes) { EXPECT_EQ(1, longEdit(codes, 1, Grant())); });
  EXPECT_THAT(
      lines, ElementsAre(
                 "3 oauth_grantCode.cpp ==> Edit", "3 oauth_utils.cpp checkStrLen[alice]",
                 "3 oauth_utils.cpp checkStrLen[" + times(64, 'c') + "]",
                 "3 oauth_utils.cpp checkStrLen[read]", "3 oauth_utils.cpp checkStrLen[1700000600]",
                 "3 oauth_utils.cpp checkStrLen[xyz]", "3 oauth_db_basic.cpp ==> DBEdit",
                 "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
                 "3 oauth_db_basic.cpp ==> GetUpdateParam", "3 oauth_db_basic.cpp ==> ConcateParam",
                 "3 oauth_db_basic.cpp ==> GetConditionParam",
                 "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                 "3 oauth_db_basic.cpp ==> DBCmdRun[UPDATE oauth_grantCode SET "
                 "client_id='sealed:" +
                     times(64, 'c') +
                     "', expired_time='1700000600', scope='read', state='xyz', username='alice' "
                     "WHERE id='1';]",
                 "3 oauth_db_basic.cpp ClientInfo Edit success, changed[1]"));
}

TEST_F(GrantCodeTraceTest, LookupsTraceTheirNames) {
  const Lines lines = traced(8, [](OAUTHDBGrantCode& codes) {
    Json::Value rows;
    codes.GetIndex("");
    codes.Get(1, &rows);
  });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_grantCode.cpp ==> GetIndex", "3 oauth_grantCode.cpp ==> Get",
                  "3 oauth_grantCode.cpp Bad parameters", "3 oauth_grantCode.cpp ==> Get",
                  "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_grantCode WHERE "
                  "id='1' ;]"));
}

TEST_F(GrantCodeTraceTest, LookupByCodeTracesEveryStep) {
  createDatabase();
  const Grant grant = insertRow("1");
  const Lines lines = traced(15, [&](OAUTHDBGrantCode& codes) {
    Json::Value rows;
    EXPECT_EQ(1, codes.Get(grant.code, &rows));
  });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_grantCode.cpp ==> Get",
                  "3 oauth_utils.cpp checkStrLen[" + grant.code + "]",
                  "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_grantCode WHERE code='" +
                      grant.code + "' ;]",
                  "3 oauth_db_basic.cpp ==> TabGetCallback",
                  "3 oauth_db_basic.cpp ##### [0][username = alice]",
                  "3 oauth_db_basic.cpp ##### [1][client_id = sealed:" + times(64, 'c') + "]",
                  "3 oauth_db_basic.cpp ##### [2][scope = read]",
                  "3 oauth_db_basic.cpp ##### [3][code = " + grant.code + "]",
                  "3 oauth_db_basic.cpp ##### [4][expired_time = 1700000600]",
                  "3 oauth_db_basic.cpp ##### [5][state = xyz]",
                  "3 oauth_db_basic.cpp ##### [6][ip = 192.0.2.7]",
                  "3 oauth_db_basic.cpp ##### [7][id = 1]",
                  "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
                  "3 oauth_db_basic.cpp ClientInfo Get Done"));
}

TEST_F(GrantCodeTraceTest, RevokingTracesItsName) {
  createDatabase();
  insertRow("1");
  const Lines lines = traced(9, [](OAUTHDBGrantCode& codes) { EXPECT_EQ(1, codes.Revoke(1)); });
  EXPECT_THAT(lines,
              ElementsAre("3 oauth_grantCode.cpp ==> Revoke", "3 oauth_db_basic.cpp ==> DBEdit",
                          "3 oauth_db_basic.cpp ==> GetUpdateParam",
                          "3 oauth_db_basic.cpp ==> ConcateParam",
                          "3 oauth_db_basic.cpp ==> GetConditionParam",
                          "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                          "3 oauth_db_basic.cpp ==> DBCmdRun[UPDATE oauth_grantCode SET "
                          "expired_time='1700000000' WHERE id='1';]",
                          "3 oauth_db_basic.cpp ClientInfo Edit success, changed[1]"));
}

TEST_F(GrantCodeTraceTest, PurgingTracesEveryDelete) {
  createDatabase();
  insertRow("1");
  insertRow("2", "1");
  const Lines lines = traced(9, [](OAUTHDBGrantCode& codes) { EXPECT_EQ(1, codes.Purge()); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_grantCode.cpp ==> Purge", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[BEGIN IMMEDIATE;]",
                  "3 oauth_grantCode.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                  "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_grantCode ;]",
                  "3 oauth_db_basic.cpp ==> TabGetCallback",
                  "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
                  "3 oauth_db_basic.cpp ==> TabGetCallback",
                  "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
                  "3 oauth_db_basic.cpp ClientInfo Get Done", "3 oauth_grantCode.cpp ==> Del",
                  "3 oauth_db_basic.cpp ==> DBDel", "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_grantCode WHERE id='2';]",
                  "3 oauth_db_basic.cpp ClientInfo Delete success, changed[1]",
                  "3 oauth_db_basic.cpp ==> DBCmd", "3 oauth_db_basic.cpp ==> DBCmdRun[COMMIT;]"));
}

// --- A store that could not be opened ---

class UnopenedGrantCodeTest : public GrantCodeTest {
 protected:
  UnopenedGrantCodeTest() { files_.removeDirectory(); }

  void expectRefusal(int result, const Lines& lines,
                     const std::function<int(OAUTHDBGrantCode&)>& operation,
                     int code = kErrCreateTable, const std::string& msg = "Create table failed") {
    OAUTHDBGrantCode codes("oauth_grantCode");
    expectError(codes, kErrCreateTable, "Create table failed");
    log_.clear();
    EXPECT_EQ(result, operation(codes));
    EXPECT_THAT(log_.lines(), ElementsAreArray(lines));
    expectError(codes, code, msg);
  }

  const Lines readRefused_{"3 oauth_db_basic.cpp DB is not ready!!",
                           "3 oauth_db_basic.cpp Get failed[oauth_grantCode]"};
  const Lines editRefused_{"3 oauth_db_basic.cpp DB is not ready!!",
                           "3 oauth_db_basic.cpp Edit failed[oauth_grantCode]"};
};

TEST_F(UnopenedGrantCodeTest, RefusesToAdd) {
  for (const auto adding : {issue, add})
    expectRefusal(
        0,
        {"3 oauth_db_basic.cpp DB is not ready!!",
         "3 oauth_db_basic.cpp Get Row Count failed[oauth_grantCode]",
         "3 oauth_db_basic.cpp Check Row Max failed[oauth_grantCode]",
         "3 oauth_grantCode.cpp GrantCode Table is full"},
        [&](OAUTHDBGrantCode& codes) {
          Json::Value result;
          const int added = adding(codes, Grant(), result);
          EXPECT_EQ(Json::Value(), result);
          return added;
        },
        kErrTableFull, "GrantCode Table is full");
}

TEST_F(UnopenedGrantCodeTest, RefusesToEdit) {
  for (const auto edit : {shortEdit, longEdit})
    expectRefusal(0, editRefused_,
                  [&](OAUTHDBGrantCode& codes) { return edit(codes, 1, Grant()); });
}

TEST_F(UnopenedGrantCodeTest, RefusesToRevoke) {
  expectRefusal(0, editRefused_, [](OAUTHDBGrantCode& codes) { return codes.Revoke(1); });
}

TEST_F(UnopenedGrantCodeTest, RefusesToDelete) {
  expectRefusal(0,
                {"3 oauth_db_basic.cpp DB is not ready!!",
                 "3 oauth_db_basic.cpp Delete failed[oauth_grantCode]"},
                [](OAUTHDBGrantCode& codes) { return codes.Del(1); });
}

TEST_F(UnopenedGrantCodeTest, RefusesToRead) {
  Json::Value rows;
  expectRefusal(0, readRefused_, [&](OAUTHDBGrantCode& codes) { return codes.Get(&rows); });
  expectRefusal(0, readRefused_, [&](OAUTHDBGrantCode& codes) { return codes.Get(1, &rows); });
  expectRefusal(0, readRefused_,
                [&](OAUTHDBGrantCode& codes) { return codes.Get(times(64), &rows); });
}

TEST_F(UnopenedGrantCodeTest, HasNoIndex) {
  expectRefusal(0, readRefused_, [](OAUTHDBGrantCode& codes) { return codes.GetIndex(times(64)); });
}

TEST_F(UnopenedGrantCodeTest, CountsAPurgeAsSuccess) {
  expectRefusal(1, readRefused_, [](OAUTHDBGrantCode& codes) { return codes.Purge(); });
}

}  // namespace
