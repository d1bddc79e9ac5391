#include "oauthctl_test.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;

namespace {

class ClientTest : public OauthctlTest {};

TEST_F(ClientTest, ListsClientsAsATable) {
  addClient('c');
  addClient('d', "Mail");
  run({"client", "disable", "2"});
  const Outcome outcome = run({"client", "list"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_EQ(
      "ID NAME        ENABLED REDIRECT URI           SCOPE\n"
      " 1 Photo album yes     album.example/callback read write\n"
      " 2 Mail        no      album.example/callback read write\n",
      outcome.out);
}

TEST_F(ClientTest, ListsClientsAsJson) {
  addClient('c');
  const Json::Value clients = json({"client", "list"});
  ASSERT_EQ(1U, clients.size());
  EXPECT_EQ(1, clients[0U]["id"].asInt());
  EXPECT_TRUE(clients[0U]["enabled"].asBool());
  EXPECT_EQ(times(64, 'c'), clients[0U]["client_id"].asString());
  EXPECT_EQ("ssss...", clients[0U]["client_secret"].asString());
  EXPECT_EQ("album.example/callback", clients[0U]["redirect_uri"].asString());
  EXPECT_EQ("read write", clients[0U]["scope"].asString());
  EXPECT_EQ("Photo album", clients[0U]["display_name"].asString());
}

TEST_F(ClientTest, SaysThatThereIsNoClient) {
  addClient('c');
  execute("DELETE FROM oauth_clientInfo");
  EXPECT_EQ("no clients\n", run({"client", "list"}).out);
  EXPECT_EQ("[]\n", run({"client", "list", "--json"}).out);
}

TEST_F(ClientTest, ShowsSecretsOnRequestOnly) {
  addClient('c');
  for (const Words& words : {Words{"client", "list"}, Words{"client", "show", "1"}})
    for (const bool asJson : {false, true}) {
      SCOPED_TRACE(words[1]);
      Words all = words;
      if (asJson) all.emplace_back("--json");
      EXPECT_THAT(run(all).out, Not(HasSubstr(times(5, 's'))));
      all.emplace_back("--show-secrets");
      EXPECT_THAT(run(all).out, HasSubstr(times(64, 's')));
    }
}

TEST_F(ClientTest, ShowsOneClientWithWhatItHolds) {
  addClient('c');
  addToken('a');
  addToken('b');
  addCode('k');
  EXPECT_EQ(
      "id            1\n"
      "name          Photo album\n"
      "enabled       yes\n"
      "client_id     " +
          times(64, 'c') +
          "\n"
          "client_secret ssss...\n"
          "redirect_uri  album.example/callback\n"
          "scope         read write\n"
          "codes         1\n"
          "tokens        2\n",
      run({"client", "show", "1"}).out);
  EXPECT_EQ(2, json({"client", "show", times(64, 'c')})["tokens"].asInt());
}

TEST_F(ClientTest, ReportsAnUnknownClient) {
  addClient('c');
  EXPECT_EQ("1 there is no client 7", complaint(run({"client", "show", "7"})));
  EXPECT_EQ("1 there is no client " + times(64, 'x'),
            complaint(run({"client", "show", times(64, 'x')})));
  EXPECT_EQ("2 'Photo' names no client: give its number or its 64 characters",
            complaint(run({"client", "show", "Photo"})));
  EXPECT_EQ("1 there is no client 7", complaint(run({"client", "disable", "7"})));
}

TEST_F(ClientTest, RegistersAClient) {
  const Json::Value made = json({"client", "add", "--name", "Bob's {} \"App\"", "--redirect-uri",
                                 "https://bob.example/cb?a=b", "--scope", "{}"});
  EXPECT_EQ(1, made["id"].asInt());
  EXPECT_EQ(64U, made["client_id"].asString().size());
  EXPECT_EQ(64U, made["client_secret"].asString().size());
  const Json::Value stored = json({"client", "show", "1", "--show-secrets"});
  EXPECT_EQ(made["client_id"], stored["client_id"]);
  EXPECT_EQ(made["client_secret"], stored["client_secret"]);
  EXPECT_EQ("Bob's {} \"App\"", stored["display_name"].asString());
  EXPECT_EQ("bob.example/cb?a=b", stored["redirect_uri"].asString());
  EXPECT_EQ("{}", stored["scope"].asString());
  EXPECT_TRUE(stored["enabled"].asBool());
  EXPECT_THAT(query("SELECT msg FROM oauth_log"),
              ElementsAre("Application registed[Bob''s {} \"App\"]"));
}

// Nobody could learn the secret later.
TEST_F(ClientTest, ShowsTheSecretEvenIfItCannotReadTheNumber) {
  addClient('c');
  execute(
      "CREATE TRIGGER t AFTER INSERT ON oauth_clientInfo BEGIN DELETE FROM oauth_clientInfo; END");
  const Words words = {"client",         "add",       "--name",  "n",
                       "--redirect-uri", "a.example", "--scope", "r"};
  const Outcome outcome = run(words);
  EXPECT_EQ(1, outcome.code);
  EXPECT_THAT(outcome.out, MatchesRegex("id            unknown\nclient_id     [0-9a-f]+\n"
                                        "client_secret [0-9a-f]+\n"));
  EXPECT_THAT(outcome.err,
              MatchesRegex("oauthctl: the client is registered, but its number cannot be read: "
                           "there is no client [0-9a-f]+\n"));
  EXPECT_TRUE(json(words)["id"].isNull());
}

TEST_F(ClientTest, MakesADatabaseThatPassesTheCheck) {
  const Outcome outcome =
      run({"client", "add", "--name", "App", "--redirect-uri", "a.example", "--scope", "read"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, HasSubstr("client_secret "));
  EXPECT_EQ(0, run({"check"}).code) << run({"check"}).out;
}

TEST_F(ClientTest, RegistersADisabledClient) {
  run({"client", "add", "--name", "App", "--redirect-uri", "a.example", "--scope", "read",
       "--disabled"});
  EXPECT_THAT(query("SELECT enable FROM oauth_clientInfo"), ElementsAre("0"));
}

TEST_F(ClientTest, TakesASecretFromStandardInput) {
  const Words add = {"client",
                     "add",
                     "--name",
                     "App",
                     "--redirect-uri",
                     "a.example",
                     "--scope",
                     "read",
                     "--secret-from-stdin"};
  EXPECT_EQ("2 a client secret has 64 bytes, not 5", complaint(run(add, "short\n")));
  EXPECT_EQ("2 standard input holds no client secret", complaint(run(add)));
  EXPECT_EQ("2 the client secret on standard input holds a NUL byte",
            complaint(run(add, times(64, 'z') + '\0' + "\n")));
  EXPECT_EQ("2 the client secret on standard input holds a NUL byte",
            complaint(run(add, times(31, 'z') + '\0' + times(32, 'z'))));
  EXPECT_EQ("", databaseBytes());
  EXPECT_EQ(0, run(add, times(64, 'z') + "\n").code);
  EXPECT_EQ(times(64, 'z'),
            json({"client", "show", "1", "--show-secrets"})["client_secret"].asString());
}

TEST_F(ClientTest, RefusesAClientAboveTheCeiling) {
  writeSettings(R"({"client_info_max": 1})");
  addClient('c');
  EXPECT_EQ("1 the registry is full: it holds 1 clients, the setting client_info_max",
            complaint(run({"client", "add", "--name", "App", "--redirect-uri", "a.example",
                           "--scope", "read"})));
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
}

TEST_F(ClientTest, EditsTheNamedColumnsOnly) {
  addClient('c', "Bob's");
  EXPECT_EQ("client 1 is changed\n", run({"client", "edit", "1", "--scope", "it's"}).out);
  EXPECT_THAT(query("SELECT display_name, redirect_uri, scope FROM oauth_clientInfo"),
              ElementsAre("Bob''s|album.example/callback|it''s"));
  EXPECT_EQ("it's", json({"client", "show", "1"})["scope"].asString());
}

// The same as when a client is registered: the server compares with the stored URI.
TEST_F(ClientTest, EditsTheRedirectUriWithoutItsScheme) {
  addClient('c');
  run({"client", "edit", "1", "--redirect-uri", "https://new.example/cb"});
  EXPECT_THAT(query("SELECT redirect_uri FROM oauth_clientInfo"), ElementsAre("new.example/cb"));
}

TEST_F(ClientTest, DisablesOneClient) {
  addClient('c');
  addClient('d');
  EXPECT_EQ("client 1 is disabled\n", run({"client", "disable", times(64, 'c')}).out);
  EXPECT_THAT(query("SELECT enable FROM oauth_clientInfo ORDER BY id"), ElementsAre("0", "1"));
  EXPECT_EQ("client 1 is enabled\n", run({"client", "enable", "1"}).out);
  EXPECT_THAT(query("SELECT enable FROM oauth_clientInfo ORDER BY id"), ElementsAre("1", "1"));
}

TEST_F(ClientTest, SaysThatTokensSurviveTheirClient) {
  addClient('c');
  addToken('a');
  addCode('k');
  const Outcome outcome = run({"client", "delete", "1", "--yes"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_EQ(
      "deleted client 1; its 1 code and 1 token stay valid, 'oauthctl token revoke --client " +
          times(64, 'c') + "' ends its logins\n",
      outcome.out);
  EXPECT_EQ(1, rowCount("oauth_token"));
  EXPECT_THAT(run({"token", "list"}).out, HasSubstr("not registered"));
  EXPECT_EQ("deleted 1 token\n", run({"token", "revoke", "--client", times(64, 'c'), "--yes"}).out);
}

TEST_F(ClientTest, DeletesAClientWithItsTokens) {
  addClient('c');
  addClient('d');
  addToken('a');
  addToken('b', "bob", kNow, 'd');
  addCode('k');
  EXPECT_EQ("deleted client 1, 1 code and 1 token\n",
            run({"client", "delete", "1", "--with-tokens", "--yes"}).out);
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
  EXPECT_THAT(query("SELECT username FROM oauth_token"), ElementsAre("bob"));
}

TEST_F(ClientTest, DeletesNothingWithoutConfirmation) {
  addClient('c');
  EXPECT_EQ(
      "2 nobody is there to ask \"Delete client 1, 'Photo album'; its 0 codes and 0 tokens stay "
      "valid?\": add --yes",
      complaint(run({"client", "delete", "1"})));
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
}

}  // namespace
