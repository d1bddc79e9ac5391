#include "oauth_clientInfo.h"

#include <json/writer.h>

#include <functional>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "oauth_log.h"
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
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace {

// Every column of a row but its id.
struct Client {
  std::string enable = "1";
  std::string client_id = times(64, 'c');
  std::string client_secret = times(64, 's');
  std::string redirect_uri = "example.com/cb";
  std::string scope = "read";
  std::string display_name = "Mail";
};

using Member = std::string Client::*;

Client clientWith(Member member, const std::string& value) {
  Client client;
  client.*member = value;
  return client;
}

struct LengthRule {
  Member member;
  const char* column;
  int min, max;
};
const LengthRule kClientId{&Client::client_id, "client_id", 64, 64};
const LengthRule kClientSecret{&Client::client_secret, "client_secret", 64, 64};
const LengthRule kRedirectUri{&Client::redirect_uri, "redirect_uri", 3, 2048};
const LengthRule kScope{&Client::scope, "scope", 1, 2048};
const LengthRule kDisplayName{&Client::display_name, "display_name", 1, 64};

// In the order in which each operation checks.
const std::vector<LengthRule> kAddRules{kClientId, kClientSecret, kRedirectUri, kScope,
                                        kDisplayName};
const std::vector<LengthRule> kEditRules{kRedirectUri, kScope, kDisplayName};

struct StoredValue {
  Member member;
  const char* column;
  std::string given, stored;
};

Json::Value credentials(const Client& client) {
  Json::Value result;
  result["client_id"] = client.client_id;
  result["client_secret"] = client.client_secret;
  return result;
}

int add(OAUTHDBClientInfo& clients, const Client& client, Json::Value& result) {
  return clients.Add(client.client_id, client.client_secret, client.redirect_uri, client.scope,
                     client.display_name, client.enable, result);
}
int add(OAUTHDBClientInfo& clients, const Client& client) {
  Json::Value result;
  return add(clients, client, result);
}
int addGenerated(OAUTHDBClientInfo& clients, const Client& client, Json::Value& result) {
  return clients.Add(client.redirect_uri, client.scope, client.display_name, result);
}
int addWithSecret(OAUTHDBClientInfo& clients, const Client& client, Json::Value& result) {
  return clients.Add(client.client_secret, client.redirect_uri, client.scope, client.display_name,
                     result);
}
int edit(OAUTHDBClientInfo& clients, long long id, const Client& client) {
  return clients.Edit(id, client.redirect_uri, client.scope, client.display_name);
}
int enable(OAUTHDBClientInfo& clients, long long id) { return clients.Enable(id); }
int disable(OAUTHDBClientInfo& clients, long long id) { return clients.Disable(id); }

class ClientInfoTest : public StoreTest {
 protected:
  static void createDatabase() { const OAUTHDBClientInfo clients("oauth_clientInfo"); }

  // A row as query() prints it.
  static std::string row(const Client& client, const std::string& id = "1") {
    return client.enable + "|" + FakeHost::sealed(client.client_id) + "|" +
           FakeHost::sealed(client.client_secret) + "|" + client.redirect_uri + "|" + client.scope +
           "|" + client.display_name + "|" + id;
  }
  Lines rows() const { return query("SELECT * FROM oauth_clientInfo ORDER BY id"); }
  Lines ids() const { return query("SELECT id FROM oauth_clientInfo ORDER BY id"); }
  Lines auditLog() const { return query("SELECT msg FROM oauth_log ORDER BY id"); }
  std::string stored(const char* column) const {
    return query(std::string("SELECT ") + column + " FROM oauth_clientInfo").at(0);
  }

  // Writes a row past the store. An id serves as the identifier's beginning, so that identifiers
  // differ.
  Client insertRow(const std::string& id) const {
    Client client;
    client.client_id.replace(0, id.size(), id);
    execute("INSERT INTO oauth_clientInfo VALUES('" + client.enable + "', '" +
            FakeHost::sealed(client.client_id) + "', '" + FakeHost::sealed(client.client_secret) +
            "', '" + client.redirect_uri + "', '" + client.scope + "', '" + client.display_name +
            "', " + id + ")");
    return client;
  }

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(OAUTHDBClientInfo&)>& body) {
    withDiagnostics(mask, [&] {
      OAUTHDBClientInfo clients("oauth_clientInfo");
      log_.clear();
      body(clients);
    });
    return log_.lines();
  }

  using Operation = std::function<int(OAUTHDBClientInfo&, const Client&)>;

  // Both bounds of every rule are accepted; one byte beyond either is an error.
  void expectLengthRules(const std::vector<LengthRule>& rules, const Operation& operation,
                         const std::function<void()>& prepare) {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    for (const LengthRule& rule : rules)
      for (const int length : {rule.min - 1, rule.min, rule.max, rule.max + 1}) {
        SCOPED_TRACE(rule.column + std::string(" of ") + std::to_string(length) + " bytes");
        prepare();
        const Lines before = rows();
        recordEarlierError(clients);
        log_.clear();
        const int done = operation(clients, clientWith(rule.member, times(length, '1')));
        if (length < rule.min || length > rule.max) {
          EXPECT_EQ(0, done);
          expectError(clients, kErrBadParameters, "Bad parameters");
          EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
          EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
          EXPECT_EQ(before, rows());
        } else {
          EXPECT_EQ(1, done);
          expectEarlierError(clients);
          EXPECT_THAT(log_.lines(), IsEmpty());
        }
      }
  }

  // With one value after the other too long, each operation names what it checked up to there.
  void expectCheckOrder(const std::vector<LengthRule>& rules, const Operation& operation) {
    Lines checked;
    for (const LengthRule& rule : rules) {
      const Client bad = clientWith(rule.member, times(rule.max + 1, '1'));
      checked.push_back("3 oauth_utils.cpp checkStrLen[" + Client().*rule.member + "]");
      Lines expected = checked;
      expected.back() = "3 oauth_utils.cpp checkStrLen[" + bad.*rule.member + "]";
      expected.emplace_back("3 oauth_clientInfo.cpp Bad parameters");
      EXPECT_THAT(traced(4, [&](OAUTHDBClientInfo& clients) { operation(clients, bad); }),
                  ElementsAreArray(expected))
          << rule.column;
    }
  }

  void expectStored(const std::vector<StoredValue>& values, const Operation& operation,
                    const std::function<void()>& prepare) {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    for (const StoredValue& value : values) {
      SCOPED_TRACE(value.column + std::string(" given as ") + value.given);
      prepare();
      EXPECT_EQ(1, operation(clients, clientWith(value.member, value.given)));
      EXPECT_EQ(value.stored, stored(value.column));
    }
  }
};

// --- Add with the caller's identifier ---

class ClientInfoAddTest : public ClientInfoTest {
 protected:
  void emptyTable() const { execute("DELETE FROM oauth_clientInfo"); }
  static int addOne(OAUTHDBClientInfo& clients, const Client& client) {
    return add(clients, client);
  }
};

TEST_F(ClientInfoAddTest, StoresEveryColumn) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_THAT(rows(), ElementsAre("1|sealed:" + times(64, 'c') + "|sealed:" + times(64, 's') +
                                  "|example.com/cb|read|Mail|1"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoAddTest, ReturnsTheCredentialsAlone) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, add(clients, Client(), result));
  EXPECT_EQ(credentials(Client()), result);
}

TEST_F(ClientInfoAddTest, LeavesOtherKeysOfTheResult) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  result["client_id"] = "stale";
  result["other"] = "kept";
  EXPECT_EQ(1, add(clients, Client(), result));
  Json::Value expected = credentials(Client());
  expected["other"] = "kept";
  EXPECT_EQ(expected, result);
}

TEST_F(ClientInfoAddTest, KeepsAnEarlierErrorOnSuccess) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  recordEarlierError(clients);
  EXPECT_EQ(1, add(clients, Client()));
  expectEarlierError(clients);
}

TEST_F(ClientInfoAddTest, RegistersADisabledClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, clientWith(&Client::enable, "0")));
  EXPECT_EQ("0", stored("enable"));
}

TEST_F(ClientInfoAddTest, RefusesAnyOtherEnableFlag) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string& flag :
       {std::string("true"), std::string(), std::string("2"), std::string("01"), std::string("1 "),
        std::string("-1"), std::string("'"), std::string("1\0", 2), std::string("0\0", 2)}) {
    SCOPED_TRACE(flag);
    recordEarlierError(clients);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, add(clients, clientWith(&Client::enable, flag), result));
    EXPECT_EQ(Json::Value(), result);
    expectError(clients, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
  }
  EXPECT_THAT(rows(), IsEmpty());
  EXPECT_THAT(auditLog(), IsEmpty());
}

TEST_F(ClientInfoAddTest, AcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(kAddRules, addOne, [this] { emptyTable(); });
}

TEST_F(ClientInfoAddTest, StopsAtTheFirstBadLength) { expectCheckOrder(kAddRules, addOne); }

TEST_F(ClientInfoAddTest, LeavesTheResultUntouchedAfterABadLength) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(0, add(clients, clientWith(&Client::scope, ""), result));
  EXPECT_EQ(Json::Value(), result);
}

TEST_F(ClientInfoAddTest, MeasuresLengthsInBytes) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  std::string name;
  for (int i = 0; i < 32; ++i) name += "\u00e9";
  EXPECT_EQ(1, add(clients, clientWith(&Client::display_name, name)));
  EXPECT_EQ(name, stored("display_name"));
  emptyTable();
  EXPECT_EQ(0, add(clients, clientWith(&Client::display_name, name + "\u00e9")));
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(ClientInfoAddTest, RemovesTheSchemeOfTheWeb) {
  expectStored(
      {
          {&Client::redirect_uri, "redirect_uri", "https://example.com/cb", "example.com/cb"},
          {&Client::redirect_uri, "redirect_uri", "http://example.com/cb", "example.com/cb"},
          {&Client::redirect_uri, "redirect_uri", "https://abc", "abc"},
          {&Client::redirect_uri, "redirect_uri", "http://abc", "abc"},
          {&Client::redirect_uri, "redirect_uri", "https://http://abc", "http://abc"},
          {&Client::redirect_uri, "redirect_uri", "http://https://abc", "https://abc"},
          {&Client::redirect_uri, "redirect_uri", "https://a'b", "a''b"},
      },
      addOne, [this] { emptyTable(); });
}

TEST_F(ClientInfoAddTest, KeepsOtherSchemesWhole) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string uri : {"ftp://example.com", "HTTPS://example.com", "Http://example.com",
                                "https:/example.com", "https:", "http:/", " https://example.com",
                                "example.com/?next=https://b", "app:callback"}) {
    SCOPED_TRACE(uri);
    emptyTable();
    EXPECT_EQ(1, add(clients, clientWith(&Client::redirect_uri, uri)));
    EXPECT_EQ(uri, stored("redirect_uri"));
  }
}

TEST_F(ClientInfoAddTest, MeasuresWhatIsLeftOfTheUri) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string scheme : {"https://", "http://"}) {
    SCOPED_TRACE(scheme);
    for (const int length : {0, 2, 2049}) {
      SCOPED_TRACE(length);
      log_.clear();
      EXPECT_EQ(0, add(clients, clientWith(&Client::redirect_uri, scheme + times(length))));
      expectError(clients, kErrBadParameters, "Bad parameters");
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
      EXPECT_THAT(rows(), IsEmpty());
    }
    for (const int length : {3, 2048}) {
      emptyTable();
      EXPECT_EQ(1, add(clients, clientWith(&Client::redirect_uri, scheme + times(length))));
      EXPECT_EQ(times(length), stored("redirect_uri"));
    }
    emptyTable();
  }
}

TEST_F(ClientInfoAddTest, StoresASingleQuoteDoubledInEveryColumn) {
  expectStored(
      {
          {&Client::client_id, "client_id", times(63, 'c') + "'",
           FakeHost::sealed(times(63, 'c') + "''")},
          {&Client::client_secret, "client_secret", "'" + times(63, 's'),
           FakeHost::sealed("''" + times(63, 's'))},
          {&Client::redirect_uri, "redirect_uri", "a'b", "a''b"},
          {&Client::scope, "scope", "'", "''"},
          {&Client::display_name, "display_name", "''", "''''"},
      },
      addOne, [this] { emptyTable(); });
}

TEST_F(ClientInfoAddTest, ReturnsCredentialsWithTheirQuotesAsGiven) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client client;
  client.client_id = "'" + times(63, 'c');
  client.client_secret = "'" + times(63, 's');
  Json::Value result;
  EXPECT_EQ(1, add(clients, client, result));
  EXPECT_EQ(credentials(client), result);
}

TEST_F(ClientInfoAddTest, KeepsStatementsInsideAValueAsText) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, clientWith(&Client::scope, "x'); DROP TABLE oauth_clientInfo; --")));
  EXPECT_EQ("x''); DROP TABLE oauth_clientInfo; --", stored("scope"));
}

TEST_F(ClientInfoAddTest, EndsEveryValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  expectStored(
      {
          {&Client::client_id, "client_id", "c" + nul + times(62, 'x'), FakeHost::sealed("c")},
          {&Client::client_secret, "client_secret", "s" + nul + times(62, 'x'),
           FakeHost::sealed("s")},
          {&Client::redirect_uri, "redirect_uri", "https://a" + nul + "'", "a"},
          {&Client::scope, "scope", nul + "read", ""},
          {&Client::display_name, "display_name", "Ma" + nul + "'il", "Ma"},
      },
      addOne, [this] { emptyTable(); });
}

TEST_F(ClientInfoAddTest, FindsTheTableFullAtItsCeiling) {
  writeSettings(R"({"client_info_max": 2})");
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, clientWith(&Client::client_id, times(64, '1'))));
  EXPECT_EQ(1, add(clients, clientWith(&Client::client_id, times(64, '2'))));
  const Lines before = rows();

  Json::Value result;
  EXPECT_EQ(0, add(clients, clientWith(&Client::client_id, times(64, '3')), result));
  expectError(clients, kErrTableFull, "ClientInfo Table is full");
  EXPECT_EQ(Json::Value(), result);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp ClientInfo Table is full"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ClientInfo Table is full"));
  EXPECT_EQ(before, rows());
  EXPECT_EQ(2, rowCount("oauth_log"));
}

TEST_F(ClientInfoAddTest, ReportsAFullTableBeforeBadArguments) {
  writeSettings(R"({"client_info_max": 1})");
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  for (const Client& bad : {clientWith(&Client::client_id, ""), clientWith(&Client::enable, "2")}) {
    recordEarlierError(clients);
    log_.clear();
    EXPECT_EQ(0, add(clients, bad));
    expectError(clients, kErrTableFull, "ClientInfo Table is full");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp ClientInfo Table is full"));
  }
}

TEST_F(ClientInfoAddTest, TakesATableItCannotCountForFull) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  clients.SetTabName("elsewhere");
  EXPECT_EQ(0, add(clients, Client()));
  expectError(clients, kErrTableFull, "ClientInfo Table is full");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: elsewhere][1]",
                          "3 oauth_db_basic.cpp Get Row Count failed[elsewhere]",
                          "3 oauth_db_basic.cpp Check Row Max failed[elsewhere]",
                          "3 oauth_clientInfo.cpp ClientInfo Table is full"));
}

TEST_F(ClientInfoAddTest, LeavesTheCredentialsInTheResultOfAFailedInsert) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  const Client second = clientWith(&Client::client_secret, times(64, 'S'));
  Json::Value result;
  EXPECT_EQ(0, add(clients, second, result));
  EXPECT_EQ(credentials(second), result);
  expectError(clients, 19, "UNIQUE constraint failed: oauth_clientInfo.client_id");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![UNIQUE constraint failed: "
                          "oauth_clientInfo.client_id][19]",
                          "3 oauth_db_basic.cpp Add failed[oauth_clientInfo]"));
  EXPECT_THAT(rows(), ElementsAre(row(Client())));
}

TEST_F(ClientInfoAddTest, StoresNothingThatCannotBeEncrypted) {
  for (const int call : {1, 2}) {
    SCOPED_TRACE(call);
    OAUTHDBClientInfo clients("oauth_clientInfo");
    log_.clear();
    host_.failEncrypt(call);
    Json::Value result;
    EXPECT_EQ(0, add(clients, Client(), result));
    EXPECT_EQ(credentials(Client()), result);
    expectError(clients, kErrCrypt, "Data Encrypt failed");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  }
  EXPECT_THAT(rows(), IsEmpty());
  EXPECT_THAT(auditLog(), IsEmpty());
}

// --- The audit line ---

class ClientInfoAuditTest : public ClientInfoTest {};

TEST_F(ClientInfoAuditTest, NamesTheRegisteredClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, FollowsEveryFormOfRegistration) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addGenerated(clients, clientWith(&Client::display_name, "one"), result));
  EXPECT_EQ(1, addWithSecret(clients, clientWith(&Client::display_name, "two"), result));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[one]", "Application registed[two]"));
}

TEST_F(ClientInfoAuditTest, DoublesAQuoteInTheName) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, clientWith(&Client::display_name, "O'Hara")));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[O''Hara]"));
}

TEST_F(ClientInfoAuditTest, IsNotWrittenForAFailedInsert) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_EQ(0, add(clients, clientWith(&Client::display_name, "again")));
  EXPECT_EQ(0, add(clients, clientWith(&Client::scope, "")));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, IsNotWrittenForLaterChanges) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  EXPECT_EQ(1, edit(clients, 1, Client()));
  EXPECT_EQ(1, clients.Disable(1));
  EXPECT_EQ(1, clients.Enable(1));
  EXPECT_EQ(1, clients.Del(1));
  EXPECT_THAT(auditLog(), IsEmpty());
}

TEST_F(ClientInfoAuditTest, MayFailWithoutSpoilingTheRegistration) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  execute(
      "CREATE TRIGGER refusal BEFORE INSERT ON oauth_log BEGIN SELECT RAISE(ABORT, 'refused'); "
      "END");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_THAT(rows(), ElementsAre(row(Client())));
  expectError(clients, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_log]"));
}

TEST_F(ClientInfoAuditTest, RotatesTheAuditLog) {
  writeSettings(R"({"log_max": 1})");
  OAUTHDBClientInfo clients("oauth_clientInfo");
  execute("INSERT INTO oauth_log VALUES(1, 'old', NULL)");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, OpensTheAuditLogForEveryAttempt) {
  const std::string opened = "open /var/packages/Keyloft/target/etc/oauth.db";
  const std::string waits = "busy_timeout 5000";
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, Client()));
  EXPECT_EQ(0, add(clients, clientWith(&Client::scope, "")));
  writeSettings(R"({"client_info_max": 1})");
  EXPECT_EQ(0, add(clients, Client()));
  EXPECT_THAT(files_.calls(), ElementsAre(opened, waits, opened, waits, "close", opened, waits,
                                          "close", opened, waits, "close"));
}

// --- Add with credentials of its own ---

class ClientInfoShortAddTest : public ClientInfoTest {};

TEST_F(ClientInfoShortAddTest, GeneratesTwoDifferentCredentials) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addGenerated(clients, Client(), result));
  EXPECT_THAT(result.getMemberNames(), ElementsAre("client_id", "client_secret"));
  EXPECT_THAT(result["client_id"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(result["client_secret"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(result["client_id"], result["client_secret"]);
}

TEST_F(ClientInfoShortAddTest, StoresAnEnabledClientWithWhatItReturns) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addGenerated(clients, Client(), result));
  Client expected;
  expected.client_id = result["client_id"].asString();
  expected.client_secret = result["client_secret"].asString();
  EXPECT_THAT(rows(), ElementsAre(row(expected)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoShortAddTest, TakesTheSecretFirst) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addWithSecret(clients, Client(), result));
  EXPECT_THAT(result["client_id"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_EQ(times(64, 's'), result["client_secret"].asString());
  EXPECT_THAT(rows(),
              ElementsAre(row(clientWith(&Client::client_id, result["client_id"].asString()))));
}

TEST_F(ClientInfoShortAddTest, RemovesTheScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const auto adding : {addGenerated, addWithSecret}) {
    execute("DELETE FROM oauth_clientInfo");
    Json::Value result;
    EXPECT_EQ(1, adding(clients, clientWith(&Client::redirect_uri, "https://abc"), result));
    EXPECT_EQ("abc", stored("redirect_uri"));
  }
}

TEST_F(ClientInfoShortAddTest, ChecksTheCallersValues) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  const auto expectRefusal = [&](const Operation& operation) {
    log_.clear();
    EXPECT_EQ(0, operation(clients, Client()));
    expectError(clients, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
  };
  Json::Value result;
  for (const LengthRule& rule : kEditRules)
    for (const auto adding : {addGenerated, addWithSecret}) {
      SCOPED_TRACE(rule.column);
      expectRefusal([&](OAUTHDBClientInfo& store, const Client&) {
        return adding(store, clientWith(rule.member, times(rule.max + 1)), result);
      });
    }
  expectRefusal([&](OAUTHDBClientInfo& store, const Client&) {
    return addWithSecret(store, clientWith(&Client::client_secret, times(63)), result);
  });
  EXPECT_EQ(Json::Value(), result);
  EXPECT_THAT(rows(), IsEmpty());
}

TEST_F(ClientInfoShortAddTest, LeavesItsCredentialsInTheResultOfAFailedInsert) {
  createDatabase();
  files_.openReadOnly();
  for (const auto adding : {addGenerated, addWithSecret}) {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, adding(clients, Client(), result));
    EXPECT_THAT(result.getMemberNames(), ElementsAre("client_id", "client_secret"));
    expectError(clients, 8, "attempt to write a readonly database");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![attempt to "
                                          "write a readonly database][8]",
                                          "3 oauth_db_basic.cpp Add failed[oauth_clientInfo]"));
  }
}

// --- Edit, Enable, Disable ---

class ClientInfoEditTest : public ClientInfoTest {
 protected:
  ClientInfoEditTest() {
    createDatabase();
    first_ = insertRow("1");
  }
  static int editOfFirst(OAUTHDBClientInfo& clients, const Client& client) {
    return edit(clients, 1, client);
  }
  void restoreRow() const {
    execute("DELETE FROM oauth_clientInfo");
    insertRow("1");
  }
  Client first_;
};

TEST_F(ClientInfoEditTest, RewritesThreeColumns) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  recordEarlierError(clients);
  first_.redirect_uri = "other.example/cb";
  first_.scope = "write";
  first_.display_name = "Calendar";
  EXPECT_EQ(1, edit(clients, 1, first_));
  EXPECT_THAT(rows(), ElementsAre(row(first_)));
  expectEarlierError(clients);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoEditTest, KeepsTheScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string uri : {"https://a", "http://example.com", "https://"}) {
    EXPECT_EQ(1, edit(clients, 1, clientWith(&Client::redirect_uri, uri)));
    EXPECT_EQ(uri, stored("redirect_uri"));
  }
}

TEST_F(ClientInfoEditTest, MeasuresTheUriWithItsScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, edit(clients, 1, clientWith(&Client::redirect_uri, "https://" + times(2040))));
  EXPECT_EQ(0, edit(clients, 1, clientWith(&Client::redirect_uri, "https://" + times(2041))));
  expectError(clients, kErrBadParameters, "Bad parameters");
  EXPECT_EQ("https://" + times(2040), stored("redirect_uri"));
}

TEST_F(ClientInfoEditTest, AcceptsExactlyTheLengthsOfItsRules) {
  expectLengthRules(kEditRules, editOfFirst, [] {});
}

TEST_F(ClientInfoEditTest, StopsAtTheFirstBadLength) { expectCheckOrder(kEditRules, editOfFirst); }

TEST_F(ClientInfoEditTest, StoresASingleQuoteDoubled) {
  expectStored(
      {
          {&Client::redirect_uri, "redirect_uri", "a'b", "a''b"},
          {&Client::scope, "scope", "'", "''"},
          {&Client::display_name, "display_name", "''", "''''"},
      },
      editOfFirst, [this] { restoreRow(); });
}

TEST_F(ClientInfoEditTest, EndsEveryValueAtItsFirstNul) {
  const std::string nul(1, '\0');
  expectStored(
      {
          {&Client::redirect_uri, "redirect_uri", "a" + nul + "'b", "a"},
          {&Client::scope, "scope", nul + "read", ""},
          {&Client::display_name, "display_name", "Ma" + nul + "il", "Ma"},
      },
      editOfFirst, [this] { restoreRow(); });
}

TEST_F(ClientInfoEditTest, SwitchesOneClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client second = insertRow("4294967297");
  recordEarlierError(clients);
  EXPECT_EQ(1, clients.Disable(4294967297LL));
  second.enable = "0";
  EXPECT_THAT(rows(), ElementsAre(row(first_), row(second, "4294967297")));
  EXPECT_EQ(1, clients.Enable(4294967297LL));
  second.enable = "1";
  EXPECT_THAT(rows(), ElementsAre(row(first_), row(second, "4294967297")));
  expectEarlierError(clients);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoEditTest, SwitchesAgainWithoutComplaint) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, clients.Enable(1));
  EXPECT_EQ(1, clients.Disable(1));
  EXPECT_EQ(1, clients.Disable(1));
  EXPECT_EQ("0", stored("enable"));
}

TEST_F(ClientInfoEditTest, FailsWithoutSuchARow) {
  const std::function<int(OAUTHDBClientInfo&, long long)> edits[] = {
      enable, disable,
      [](OAUTHDBClientInfo& clients, long long id) { return edit(clients, id, Client()); }};
  for (const auto& change : edits)
    for (const long long id : {0LL, -1LL, 2LL, 4294967297LL}) {
      SCOPED_TRACE(id);
      OAUTHDBClientInfo clients("oauth_clientInfo");
      recordEarlierError(clients);
      log_.clear();
      EXPECT_EQ(0, change(clients, id));
      expectEarlierError(clients);
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Edit failed[oauth_clientInfo]"));
    }
  EXPECT_THAT(rows(), ElementsAre(row(first_)));
}

TEST_F(ClientInfoEditTest, ReportsAFailedStatement) {
  files_.openReadOnly();
  const std::function<int(OAUTHDBClientInfo&, long long)> edits[] = {
      enable, disable,
      [](OAUTHDBClientInfo& clients, long long id) { return edit(clients, id, Client()); }};
  for (const auto& change : edits) {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    log_.clear();
    EXPECT_EQ(0, change(clients, 1));
    expectError(clients, 8, "attempt to write a readonly database");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![attempt to "
                                          "write a readonly database][8]",
                                          "3 oauth_db_basic.cpp Edit failed[oauth_clientInfo]"));
  }
}

// --- Del ---

class ClientInfoDelTest : public ClientInfoTest {};

TEST_F(ClientInfoDelTest, RemovesOneRow) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const char* const id : {"1", "2147483648", "4294967296", "4294967297"}) insertRow(id);
  recordEarlierError(clients);
  EXPECT_EQ(1, clients.Del(4294967297LL));
  EXPECT_EQ(1, clients.Del(2147483648LL));
  EXPECT_THAT(ids(), ElementsAre("1", "4294967296"));
  expectEarlierError(clients);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoDelTest, FailsWithoutSuchARow) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  recordEarlierError(clients);
  EXPECT_EQ(0, clients.Del(4294967297LL));
  expectEarlierError(clients);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Delete failed[oauth_clientInfo]"));
  EXPECT_THAT(ids(), ElementsAre("1"));
}

TEST_F(ClientInfoDelTest, ReportsAFailedStatement) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  execute(
      "CREATE TRIGGER refusal BEFORE DELETE ON oauth_clientInfo BEGIN SELECT RAISE(FAIL, 'kept'); "
      "END");
  EXPECT_EQ(0, clients.Del(1));
  expectError(clients, 19, "kept");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                                        "3 oauth_db_basic.cpp Delete failed[oauth_clientInfo]"));
  EXPECT_THAT(ids(), ElementsAre("1"));
}

// --- Look-ups ---

class ClientInfoGetTest : public ClientInfoTest {
 protected:
  static Json::Value document(const Client& client, const std::string& id) {
    Json::Value result = credentials(client);
    result["enable"] = client.enable;
    result["redirect_uri"] = client.redirect_uri;
    result["scope"] = client.scope;
    result["display_name"] = client.display_name;
    result["id"] = id;
    return result;
  }
  static Json::Value list(const std::vector<Json::Value>& rows) {
    Json::Value result(Json::arrayValue);
    for (const Json::Value& row : rows) result.append(row);
    return result;
  }
};

TEST_F(ClientInfoGetTest, FindsAClientByItsPlainIdentifier) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  const Client second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(second.client_id, &rows));
  EXPECT_EQ(list({document(second, "2")}), rows);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoGetTest, FindsARowById) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  for (const long long id : {2147483648LL, 4294967297LL, 9223372036854775807LL, -5LL}) {
    SCOPED_TRACE(id);
    const Client client = insertRow(std::to_string(id));
    Json::Value rows;
    EXPECT_EQ(1, clients.Get(id, &rows));
    EXPECT_EQ(list({document(client, std::to_string(id))}), rows);
  }
}

TEST_F(ClientInfoGetTest, ReadsTheWholeTable) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  const Client first = insertRow("1");
  const Client second = insertRow("2");
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(&rows));
  EXPECT_EQ(list({document(first, "1"), document(second, "2")}), rows);
}

TEST_F(ClientInfoGetTest, FindsDisabledClients) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client client = insertRow("1");
  EXPECT_EQ(1, clients.Disable(1));
  client.enable = "0";
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(client.client_id, &rows));
  EXPECT_EQ(list({document(client, "1")}), rows);
}

TEST_F(ClientInfoGetTest, SucceedsWithoutARow) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  recordEarlierError(clients);
  const Json::Value none(Json::arrayValue);
  Json::Value rows("before");
  EXPECT_EQ(1, clients.Get(times(64), &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, clients.Get(1, &rows));
  EXPECT_EQ(none, rows);
  rows = "before";
  EXPECT_EQ(1, clients.Get(&rows));
  EXPECT_EQ(none, rows);
  expectEarlierError(clients);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoGetTest, AcceptsIdentifiersOf64BytesOnly) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const int length : {0, 63, 65, 100000}) {
    SCOPED_TRACE(length);
    recordEarlierError(clients);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, clients.Get(times(length), &rows));
    EXPECT_EQ(Json::Value("before"), rows);
    expectError(clients, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
  }
  EXPECT_THAT(host_.calls(), IsEmpty());
}

TEST_F(ClientInfoGetTest, FindsAnIdentifierWithAQuoteThatAddStored) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client client = clientWith(&Client::client_id, "'" + times(63, 'c'));
  EXPECT_EQ(1, add(clients, client));
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(client.client_id, &rows));
  client.client_id = "''" + times(63, 'c');
  EXPECT_EQ(list({document(client, "1")}), rows);
}

TEST_F(ClientInfoGetTest, TakesWildcardsLiterally) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  for (const char wildcard : {'%', '_', '*', '?'}) {
    SCOPED_TRACE(wildcard);
    Json::Value rows;
    EXPECT_EQ(1, clients.Get(times(64, wildcard), &rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  }
}

TEST_F(ClientInfoGetTest, EndsTheIdentifierAtItsFirstNul) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client client;
  client.client_id[10] = '\0';
  EXPECT_EQ(1, add(clients, client));
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(client.client_id, &rows));
  client.client_id.resize(10);
  EXPECT_EQ(list({document(client, "1")}), rows);
}

TEST_F(ClientInfoGetTest, CallsARefusedEncryptionAFailedDecryption) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  host_.failEncrypt(1);
  Json::Value rows("before");
  EXPECT_EQ(0, clients.Get(times(64), &rows));
  EXPECT_EQ(Json::Value("before"), rows);
  expectError(clients, kErrCrypt, "Data Decrypt failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
}

TEST_F(ClientInfoGetTest, DeliversASecretThatCannotBeDecryptedAsStored) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Client client = insertRow("1");
  execute("UPDATE oauth_clientInfo SET client_secret = 'plain'");
  client.client_secret = "plain";
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(client.client_id, &rows));
  EXPECT_EQ(list({document(client, "1")}), rows);
  expectError(clients, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
}

TEST_F(ClientInfoGetTest, ReportsAFailedRead) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  execute("DROP TABLE oauth_clientInfo");
  const std::function<int(Json::Value*)> reads[] = {
      [&](Json::Value* rows) { return clients.Get(times(64), rows); },
      [&](Json::Value* rows) { return clients.Get(1, rows); },
      [&](Json::Value* rows) { return clients.Get(rows); },
  };
  for (const auto& read : reads) {
    recordEarlierError(clients);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, read(&rows));
    EXPECT_EQ(Json::Value(Json::arrayValue), rows);
    expectError(clients, 1, "no such table: oauth_clientInfo");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                          "table: oauth_clientInfo][1]",
                                          "3 oauth_db_basic.cpp Get failed[oauth_clientInfo]"));
  }
}

// --- GetIndex ---

class ClientInfoIndexTest : public ClientInfoTest {};

TEST_F(ClientInfoIndexTest, IsTheLow32BitsOfTheId) {
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
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const auto& [id, index] : cases) {
    const Client client = insertRow(id);
    EXPECT_EQ(index, clients.GetIndex(client.client_id)) << id;
  }
}

TEST_F(ClientInfoIndexTest, IsZeroForAnUnknownClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(0, clients.GetIndex(times(64)));
  expectError(clients, kErrNone, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ClientInfoIndexTest, IsZeroForABadLength) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const int length : {0, 63, 65}) {
    log_.clear();
    EXPECT_EQ(0, clients.GetIndex(times(length)));
    expectError(clients, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
  }
}

TEST_F(ClientInfoIndexTest, IsZeroWithoutEncryption) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  const Client client = insertRow("1");
  host_.failEncrypt(1);
  EXPECT_EQ(0, clients.GetIndex(client.client_id));
  expectError(clients, kErrCrypt, "Data Decrypt failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
}

TEST_F(ClientInfoIndexTest, IsZeroAfterAFailedRead) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  execute("DROP TABLE oauth_clientInfo");
  EXPECT_EQ(0, clients.GetIndex(times(64)));
  expectError(clients, 1, "no such table: oauth_clientInfo");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such "
                                        "table: oauth_clientInfo][1]",
                                        "3 oauth_db_basic.cpp Get failed[oauth_clientInfo]"));
}

// --- Diagnostics ---

Lines linesAfterOpeningTheLog(const Client& client) {
  const std::string insertClient =
      "INSERT INTO oauth_clientInfo (client_id, client_secret, display_name, enable, id, "
      "redirect_uri, scope) VALUES('" +
      FakeHost::sealed(client.client_id) + "', '" + FakeHost::sealed(client.client_secret) +
      "', 'Mail', '1', NULL, 'example.com/cb', 'read');";
  const std::string insertMessage =
      "INSERT INTO oauth_log (id, msg, timestamp) "
      "VALUES(NULL, 'Application registed[Mail]', strftime('%s','now'));";
  const std::string trim =
      "DELETE FROM oauth_log WHERE timestamp IN (SELECT timestamp FROM oauth_log "
      "ORDER BY timestamp DESC LIMIT -1 OFFSET 1000)";
  return {
      "3 oauth_db_basic.cpp ==> DBCheckRowMax",
      "3 oauth_db_basic.cpp ==> DBGetRowCount",
      "3 oauth_db_basic.cpp ==> DBCmd",
      "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_clientInfo;]",
      "3 oauth_db_basic.cpp ==> TabCountCallback",
      "3 oauth_db_basic.cpp Table Row Count[0]",
      "3 oauth_utils.cpp checkStrLen[" + client.client_id + "]",
      "3 oauth_utils.cpp checkStrLen[" + client.client_secret + "]",
      "3 oauth_utils.cpp checkStrLen[example.com/cb]",
      "3 oauth_utils.cpp checkStrLen[read]",
      "3 oauth_utils.cpp checkStrLen[Mail]",
      "3 oauth_db_basic.cpp ==> DBAdd",
      "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
      "3 oauth_db_basic.cpp ==> ParamEncrypt[client_secret]",
      "3 oauth_db_basic.cpp ==> GetInsertParam",
      "3 oauth_db_basic.cpp ==> DBCmd",
      "3 oauth_db_basic.cpp ==> DBCmdRun[" + insertClient + "]",
      "3 oauth_db_basic.cpp [oauth_clientInfo] Add success, changed[1]",
      "3 oauth_log.cpp ==> Add",
      "3 oauth_db_basic.cpp ==> DBAdd",
      "3 oauth_db_basic.cpp ==> GetInsertParam",
      "3 oauth_db_basic.cpp ==> DBCmd",
      "3 oauth_db_basic.cpp ==> DBCmdRun[" + insertMessage + "]",
      "3 oauth_db_basic.cpp [oauth_log] Add success, changed[1]",
      "3 oauth_db_basic.cpp ==> DBCmd",
      "3 oauth_db_basic.cpp ==> DBCmdRun[" + trim + "]",
  };
}

class ClientInfoTraceTest : public ClientInfoTest {
 protected:
  using Registration = int (*)(OAUTHDBClientInfo&, const Client&, Json::Value&);

  // Registers and compares all that is logged with what the full form logs.
  void expectRegistrationTrace(Registration registration) {
    Client client;
    Lines opening, lines;
    withDiagnostics(15, [&] {
      OAUTHDBClientInfo clients("oauth_clientInfo");
      log_.clear();
      { const OAUTHDBLog auditLog("oauth_log"); }
      opening = log_.lines();
      log_.clear();
      Json::Value result;
      EXPECT_EQ(1, registration(clients, client, result));
      lines = log_.lines();
      client.client_id = result["client_id"].asString();
      client.client_secret = result["client_secret"].asString();
    });
    const Lines after = linesAfterOpeningTheLog(client);
    Lines expected{"3 oauth_clientInfo.cpp ==> Add"};
    expected.insert(expected.end(), opening.begin(), opening.end());
    expected.insert(expected.end(), after.begin(), after.end());
    EXPECT_THAT(lines, ElementsAreArray(expected));
  }
};

TEST_F(ClientInfoTraceTest, FullFormTracesEveryStep) { expectRegistrationTrace(add); }

TEST_F(ClientInfoTraceTest, GeneratingFormHasNoTraceOfItsOwn) {
  expectRegistrationTrace(addGenerated);
}

TEST_F(ClientInfoTraceTest, FormWithTheSecretHasNoTraceOfItsOwn) {
  expectRegistrationTrace(addWithSecret);
}

TEST_F(ClientInfoTraceTest, EditTracesEveryStep) {
  createDatabase();
  insertRow("1");
  const Lines lines =
      traced(15, [](OAUTHDBClientInfo& clients) { EXPECT_EQ(1, edit(clients, 1, Client())); });
  EXPECT_THAT(
      lines,
      ElementsAre(
          "3 oauth_clientInfo.cpp ==> Edit", "3 oauth_utils.cpp checkStrLen[example.com/cb]",
          "3 oauth_utils.cpp checkStrLen[read]", "3 oauth_utils.cpp checkStrLen[Mail]",
          "3 oauth_db_basic.cpp ==> DBEdit", "3 oauth_db_basic.cpp ==> GetUpdateParam",
          "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> GetConditionParam",
          "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[UPDATE oauth_clientInfo SET "
          "display_name='Mail', redirect_uri='example.com/cb', scope='read' WHERE "
          "id='1';]",
          "3 oauth_db_basic.cpp ClientInfo Edit success, changed[1]"));
}

TEST_F(ClientInfoTraceTest, SwitchesTraceEveryStep) {
  createDatabase();
  insertRow("1");
  const auto expectTrace = [this](const std::string& name, const std::string& flag,
                                  int (*change)(OAUTHDBClientInfo&, long long)) {
    const Lines lines =
        traced(15, [&](OAUTHDBClientInfo& clients) { EXPECT_EQ(1, change(clients, 1)); });
    EXPECT_THAT(
        lines,
        ElementsAre("3 oauth_clientInfo.cpp ==> " + name, "3 oauth_db_basic.cpp ==> DBEdit",
                    "3 oauth_db_basic.cpp ==> GetUpdateParam",
                    "3 oauth_db_basic.cpp ==> ConcateParam",
                    "3 oauth_db_basic.cpp ==> GetConditionParam",
                    "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                    "3 oauth_db_basic.cpp ==> DBCmdRun[UPDATE oauth_clientInfo SET enable='" +
                        flag + "' WHERE id='1';]",
                    "3 oauth_db_basic.cpp ClientInfo Edit success, changed[1]"));
  };
  expectTrace("Enable", "1", enable);
  expectTrace("Disable", "0", disable);
}

TEST_F(ClientInfoTraceTest, DelTracesEveryStep) {
  createDatabase();
  insertRow("1");
  const Lines lines = traced(15, [](OAUTHDBClientInfo& clients) { EXPECT_EQ(1, clients.Del(1)); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_clientInfo.cpp ==> Del", "3 oauth_db_basic.cpp ==> DBDel",
                  "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_clientInfo WHERE id='1';]",
                  "3 oauth_db_basic.cpp ClientInfo Delete success, changed[1]"));
}

TEST_F(ClientInfoTraceTest, IndexTracesTheLookupToo) {
  createDatabase();
  const Client client = insertRow("1");
  const Lines lines = traced(
      15, [&](OAUTHDBClientInfo& clients) { EXPECT_EQ(1, clients.GetIndex(client.client_id)); });
  const std::string sealedId = FakeHost::sealed(client.client_id);
  EXPECT_THAT(
      lines,
      ElementsAre(
          "3 oauth_clientInfo.cpp ==> GetIndex", "3 oauth_clientInfo.cpp ==> Get",
          "3 oauth_utils.cpp checkStrLen[" + client.client_id + "]",
          "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
          "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> ConcateParam",
          "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_clientInfo WHERE client_id='" +
              sealedId + "' ;]",
          "3 oauth_db_basic.cpp ==> TabGetCallback", "3 oauth_db_basic.cpp ##### [0][enable = 1]",
          "3 oauth_db_basic.cpp ##### [1][client_id = " + sealedId + "]",
          "3 oauth_db_basic.cpp ##### [2][client_secret = sealed:" + times(64, 's') + "]",
          "3 oauth_db_basic.cpp ##### [3][redirect_uri = example.com/cb]",
          "3 oauth_db_basic.cpp ##### [4][scope = read]",
          "3 oauth_db_basic.cpp ##### [5][display_name = Mail]",
          "3 oauth_db_basic.cpp ##### [6][id = 1]",
          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_secret]",
          "3 oauth_db_basic.cpp ClientInfo Get Done"));
}

TEST_F(ClientInfoTraceTest, LookupsTraceTheirNames) {
  const Lines lines = traced(8, [](OAUTHDBClientInfo& clients) {
    Json::Value rows;
    clients.Get(1, &rows);
    clients.Get(&rows);
  });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_clientInfo.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                  "3 oauth_db_basic.cpp ==> GetConditionParam",
                  "3 oauth_db_basic.cpp ==> ConcateParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_clientInfo WHERE "
                  "id='1' ;]",
                  "3 oauth_clientInfo.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                  "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_clientInfo ;]"));
}

// --- A store that could not be opened ---

class UnopenedClientInfoTest : public ClientInfoTest {
 protected:
  UnopenedClientInfoTest() { files_.removeDirectory(); }

  void expectRefusal(const Lines& lines, const std::function<int(OAUTHDBClientInfo&)>& operation,
                     int code = kErrCreateTable, const std::string& msg = "Create table failed") {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    expectError(clients, kErrCreateTable, "Create table failed");
    log_.clear();
    EXPECT_EQ(0, operation(clients));
    EXPECT_THAT(log_.lines(), ElementsAreArray(lines));
    expectError(clients, code, msg);
  }

  const Lines readRefused_{"3 oauth_db_basic.cpp DB is not ready!!",
                           "3 oauth_db_basic.cpp Get failed[oauth_clientInfo]"};
  const Lines editRefused_{"3 oauth_db_basic.cpp DB is not ready!!",
                           "3 oauth_db_basic.cpp Edit failed[oauth_clientInfo]"};
};

TEST_F(UnopenedClientInfoTest, RefusesToAddAfterTheAuditLogFailed) {
  for (const auto adding : {addGenerated, addWithSecret, static_cast<decltype(addGenerated)*>(add)})
    expectRefusal(
        {"3 oauth_db_basic.cpp Open DB failed!![14]",
         "3 oauth_db_basic.cpp Run Command failed!![][21]",
         "3 oauth_db_basic.cpp Run Command failed!![][21]",
         "3 oauth_db_basic.cpp Create Table failed!![meta]",
         "3 oauth_db_basic.cpp DB is not ready!!",
         "3 oauth_db_basic.cpp Get Row Count failed[oauth_clientInfo]",
         "3 oauth_db_basic.cpp Check Row Max failed[oauth_clientInfo]",
         "3 oauth_clientInfo.cpp ClientInfo Table is full"},
        [&](OAUTHDBClientInfo& clients) {
          Json::Value result;
          const int added = adding(clients, Client(), result);
          EXPECT_EQ(Json::Value(), result);
          return added;
        },
        kErrTableFull, "ClientInfo Table is full");
}

TEST_F(UnopenedClientInfoTest, RefusesToEdit) {
  expectRefusal(editRefused_,
                [](OAUTHDBClientInfo& clients) { return edit(clients, 1, Client()); });
  expectRefusal(editRefused_, [](OAUTHDBClientInfo& clients) { return clients.Enable(1); });
  expectRefusal(editRefused_, [](OAUTHDBClientInfo& clients) { return clients.Disable(1); });
}

TEST_F(UnopenedClientInfoTest, RefusesToDelete) {
  expectRefusal({"3 oauth_db_basic.cpp DB is not ready!!",
                 "3 oauth_db_basic.cpp Delete failed[oauth_clientInfo]"},
                [](OAUTHDBClientInfo& clients) { return clients.Del(1); });
}

TEST_F(UnopenedClientInfoTest, RefusesToRead) {
  Json::Value rows;
  expectRefusal(readRefused_, [&](OAUTHDBClientInfo& clients) { return clients.Get(&rows); });
  expectRefusal(readRefused_, [&](OAUTHDBClientInfo& clients) { return clients.Get(1, &rows); });
  expectRefusal(readRefused_,
                [&](OAUTHDBClientInfo& clients) { return clients.Get(times(64), &rows); });
}

TEST_F(UnopenedClientInfoTest, HasNoIndex) {
  expectRefusal(readRefused_,
                [](OAUTHDBClientInfo& clients) { return clients.GetIndex(times(64)); });
}

}  // namespace
