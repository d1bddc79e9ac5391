#include "oauth_clientInfo.h"

#include "every_store.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::MatchesRegex;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrCrypt;
using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::kErrTableFull;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;

namespace {

class ClientInfoTest : public RowStoreTest {
 protected:
  ClientInfoTest() : RowStoreTest(kClients) {}

  Lines auditLog() const { return query("SELECT msg FROM oauth_log ORDER BY id"); }
};

// --- Add with the caller's identifier ---

class ClientInfoAddTest : public ClientInfoTest {};

TEST_F(ClientInfoAddTest, RegistersADisabledClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, with(its_.row, "enable", "0")));
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
    EXPECT_EQ(0, add(clients, with(its_.row, "enable", flag), result));
    EXPECT_EQ(Json::Value(), result);
    expectError(clients, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
  }
  EXPECT_THAT(rows(), IsEmpty());
  EXPECT_THAT(auditLog(), IsEmpty());
}

TEST_F(ClientInfoAddTest, RemovesTheSchemeOfTheWeb) {
  const std::pair<const char*, const char*> cases[] = {
      {"https://example.com/cb", "example.com/cb"},
      {"http://example.com/cb", "example.com/cb"},
      {"https://abc", "abc"},
      {"http://abc", "abc"},
      {"https://http://abc", "http://abc"},
      {"http://https://abc", "https://abc"},
      {"https://a'b", "a''b"},
  };
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const auto& [given, kept] : cases) {
    SCOPED_TRACE(given);
    emptyTable();
    EXPECT_EQ(1, add(clients, with(its_.row, "redirect_uri", given)));
    EXPECT_EQ(kept, stored("redirect_uri"));
  }
}

TEST_F(ClientInfoAddTest, KeepsOtherSchemesWhole) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string uri : {"ftp://example.com", "HTTPS://example.com", "Http://example.com",
                                "https:/example.com", "https:", "http:/", " https://example.com",
                                "example.com/?next=https://b", "app:callback"}) {
    SCOPED_TRACE(uri);
    emptyTable();
    EXPECT_EQ(1, add(clients, with(its_.row, "redirect_uri", uri)));
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
      EXPECT_EQ(0, add(clients, with(its_.row, "redirect_uri", scheme + times(length))));
      expectError(clients, kErrBadParameters, "Bad parameters");
      EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp Bad parameters"));
      EXPECT_THAT(rows(), IsEmpty());
    }
    for (const int length : {3, 2048}) {
      emptyTable();
      EXPECT_EQ(1, add(clients, with(its_.row, "redirect_uri", scheme + times(length))));
      EXPECT_EQ(times(length), stored("redirect_uri"));
    }
    emptyTable();
  }
}

TEST_F(ClientInfoAddTest, ReportsAFullTableBeforeABadFlag) {
  writeSettings(R"({"client_info_max": 1})");
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_EQ(0, add(clients, with(its_.row, "enable", "2")));
  expectError(clients, kErrTableFull, "ClientInfo Table is full");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_clientInfo.cpp ClientInfo Table is full"));
}

// --- The audit line ---

class ClientInfoAuditTest : public ClientInfoTest {};

TEST_F(ClientInfoAuditTest, NamesTheRegisteredClient) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, FollowsEveryFormOfRegistration) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addGenerated(clients, with(its_.row, "display_name", "one"), result));
  EXPECT_EQ(1, addWithSecret(clients, with(its_.row, "display_name", "two"), result));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[one]", "Application registed[two]"));
}

TEST_F(ClientInfoAuditTest, DoublesAQuoteInTheName) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, with(its_.row, "display_name", "O'Hara")));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[O''Hara]"));
}

TEST_F(ClientInfoAuditTest, IsNotWrittenForAFailedInsert) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_EQ(0, add(clients, with(its_.row, "display_name", "again")));
  EXPECT_EQ(0, add(clients, with(its_.row, "scope", "")));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, IsNotWrittenForLaterChanges) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  insertRow("1");
  EXPECT_EQ(1, edit(clients, 1, its_.row));
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
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_THAT(rows(), ElementsAre(printed(its_.row)));
  expectError(clients, kErrNone, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_log]"));
}

TEST_F(ClientInfoAuditTest, RotatesTheAuditLog) {
  writeSettings(R"({"log_max": 1})");
  OAUTHDBClientInfo clients("oauth_clientInfo");
  execute("INSERT INTO oauth_log VALUES(1, 'old', NULL)");
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_THAT(auditLog(), ElementsAre("Application registed[Mail]"));
}

TEST_F(ClientInfoAuditTest, OpensTheAuditLogForEveryAttempt) {
  const std::string opened = "open /var/packages/Keyloft/target/etc/oauth.db";
  const std::string waits = "busy_timeout 5000";
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, add(clients, its_.row));
  EXPECT_EQ(0, add(clients, with(its_.row, "scope", "")));
  writeSettings(R"({"client_info_max": 1})");
  EXPECT_EQ(0, add(clients, its_.row));
  EXPECT_THAT(files_.calls(), ElementsAre(opened, waits, opened, waits, "close", opened, waits,
                                          "close", opened, waits, "close"));
}

// --- Add with credentials of its own ---

class ClientInfoShortAddTest : public ClientInfoTest {};

TEST_F(ClientInfoShortAddTest, TakesTheSecretFirst) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, addWithSecret(clients, its_.row, result));
  EXPECT_THAT(result["client_id"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_EQ(times(64, 's'), result["client_secret"].asString());
  EXPECT_THAT(rows(),
              ElementsAre(printed(with(its_.row, "client_id", result["client_id"].asString()))));
}

TEST_F(ClientInfoShortAddTest, RemovesTheScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const auto adding : {addGenerated, addWithSecret}) {
    emptyTable();
    Json::Value result;
    EXPECT_EQ(1, adding(clients, with(its_.row, "redirect_uri", "https://abc"), result));
    EXPECT_EQ("abc", stored("redirect_uri"));
  }
}

// --- Edit, Enable, Disable ---

class ClientInfoEditTest : public ClientInfoTest {
 protected:
  ClientInfoEditTest() {
    createDatabase();
    insertRow("1");
  }
};

TEST_F(ClientInfoEditTest, KeepsTheScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  for (const std::string uri : {"https://a", "http://example.com", "https://"}) {
    EXPECT_EQ(1, edit(clients, 1, with(its_.row, "redirect_uri", uri)));
    EXPECT_EQ(uri, stored("redirect_uri"));
  }
}

TEST_F(ClientInfoEditTest, MeasuresTheUriWithItsScheme) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, edit(clients, 1, with(its_.row, "redirect_uri", "https://" + times(2040))));
  EXPECT_EQ(0, edit(clients, 1, with(its_.row, "redirect_uri", "https://" + times(2041))));
  expectError(clients, kErrBadParameters, "Bad parameters");
  EXPECT_EQ("https://" + times(2040), stored("redirect_uri"));
}

TEST_F(ClientInfoEditTest, SwitchesAgainWithoutComplaint) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_EQ(1, clients.Enable(1));
  EXPECT_EQ(1, clients.Disable(1));
  EXPECT_EQ(1, clients.Disable(1));
  EXPECT_EQ("0", stored("enable"));
}

// --- Look-ups ---

class ClientInfoGetTest : public ClientInfoTest {};

TEST_F(ClientInfoGetTest, FindsDisabledClients) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  const Row client = insertRow("1");
  EXPECT_EQ(1, clients.Disable(1));
  Json::Value rows;
  EXPECT_EQ(1, clients.Get(client.at("client_id"), &rows));
  EXPECT_EQ(list({document(with(client, "enable", "0"), "1")}), rows);
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

TEST_F(ClientInfoGetTest, FindsNoIndexWithoutEncryption) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  const Row client = insertRow("1");
  host_.failEncrypt(1);
  EXPECT_EQ(0, clients.GetIndex(client.at("client_id")));
  expectError(clients, kErrCrypt, "Data Decrypt failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
}

// --- Diagnostics ---

Lines linesAfterOpeningTheLog(const Row& client) {
  const std::string insertClient =
      "INSERT INTO oauth_clientInfo (client_id, client_secret, display_name, enable, id, "
      "redirect_uri, scope) VALUES('" +
      FakeHost::sealed(client.at("client_id")) + "', '" +
      FakeHost::sealed(client.at("client_secret")) +
      "', 'Mail', '1', NULL, 'example.com/cb', 'read');";
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
      "3 oauth_utils.cpp checkStrLen[" + client.at("client_id") + "]",
      "3 oauth_utils.cpp checkStrLen[" + client.at("client_secret") + "]",
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
      std::string("3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_log (id, msg, timestamp) ") +
          "VALUES(NULL, 'Application registed[Mail]', strftime('%s','now'));]",
      "3 oauth_db_basic.cpp [oauth_log] Add success, changed[1]",
      "3 oauth_db_basic.cpp ==> DBCmd",
      "3 oauth_db_basic.cpp ==> DBCmdRun[" + trim + "]",
  };
}

class ClientInfoTraceTest : public ClientInfoTest {
 protected:
  using Registration = int (*)(OAUTHDBClientInfo&, const Row&, Json::Value&);

  // Registers and compares all that is logged with what the full form logs.
  void expectRegistrationTrace(Registration registration) {
    Row client = its_.row;
    Lines opening, lines;
    withDiagnostics(15, [&] {
      OAUTHDBClientInfo clients("oauth_clientInfo");
      log_.clear();
      { const ZEVOOAUTHSERVER::OAUTHDBLog auditLog("oauth_log"); }
      opening = log_.lines();
      log_.clear();
      Json::Value result;
      EXPECT_EQ(1, registration(clients, client, result));
      lines = log_.lines();
      for (const std::string& column : its_.secrets) client[column] = result[column].asString();
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

}  // namespace
