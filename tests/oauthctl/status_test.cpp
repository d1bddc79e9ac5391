#include "oauthctl_test.h"

using testing::HasSubstr;

namespace {

class StatusTest : public OauthctlTest {};

TEST_F(StatusTest, ShowsEverything) {
  addClient('c');
  addCode('k', "alice", kNow - 120);
  addToken('a');
  addToken('b', "alice", kNow - 3 * kDay);
  writeSettings(R"({"token_max": 50000, "log_max": "many", "token_expired": 3600})");
  const Outcome outcome = run({"status"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_EQ("", outcome.err);
  EXPECT_EQ(
      "TABLE   ROWS CEILING USED EXPIRED SOONEST EXPIRY LATEST EXPIRY\n"
      "clients    1    1000  0 %       - -              -\n"
      "codes      1    1000  0 %       1 2 min ago      2 min ago\n"
      "tokens     2   10000  0 %       1 3 days ago     in 10 min\n"
      "log        1    1000  0 %       - -              -\n"
      "\n"
      "SETTING           VALUE WHERE FROM\n"
      "client_info_max    1000 default\n"
      "grantcode_max      1000 default\n"
      "token_max         10000 clamped from 50000\n"
      "log_max            1000 wrong type in the file, default\n"
      "grantcode_expired   600 default\n"
      "token_expired      3600 file\n"
      "log_level             0 default\n"
      "\n"
      "file            " +
          files_.database() + "\nsize            " + std::to_string(databaseBytes().size()) +
          " bytes\n"
          "schema versions oauth_clientInfo 2, oauth_grantCode 2, oauth_token 2\n",
      outcome.out);
}

TEST_F(StatusTest, ShowsTheSameAsJson) {
  addToken('a', "alice", kNow - 5);
  writeSettings(R"({"token_max": 0, "log_level": 3})");
  const Json::Value status = json({"status"});
  EXPECT_EQ(files_.database(), status["database"]["path"].asString());
  EXPECT_EQ(databaseBytes().size(), status["database"]["bytes"].asUInt64());
  EXPECT_EQ("2", status["database"]["schema_versions"]["oauth_token"].asString());
  const Json::Value& tokens = status["tables"][2U];
  EXPECT_EQ("tokens", tokens["table"].asString());
  EXPECT_EQ(1, tokens["rows"].asInt());
  EXPECT_EQ(1000, tokens["ceiling"].asInt());
  EXPECT_EQ(1, tokens["expired"].asInt());
  EXPECT_EQ(kNow - 5, tokens["latest_expiry"].asInt64());
  EXPECT_FALSE(tokens["needs_attention"].asBool());
  const Json::Value& settings = status["settings"]["values"];
  EXPECT_EQ("below 1 in the file, default", settings["token_max"]["from"].asString());
  EXPECT_EQ(3, settings["log_level"]["value"].asInt());
  EXPECT_EQ("file", settings["log_level"]["from"].asString());
  EXPECT_EQ(0U, status["warnings"].size());
}

TEST_F(StatusTest, WarnsFromEightyPercentOn) {
  writeSettings(R"({"token_max": 5, "grantcode_max": 5})");
  for (const char token : {'1', '2', '3'}) addToken(token);
  EXPECT_EQ(0, run({"status"}).code);
  addToken('4', "alice", kNow - 1);
  const Outcome outcome = run({"status"});
  EXPECT_EQ(1, outcome.code);
  EXPECT_EQ(
      "oauthctl: tokens are 80 % full, 4 of 5, expired ones count (1): purge them or raise "
      "token_max\n",
      outcome.err);
  EXPECT_TRUE(json({"status"})["tables"][2U]["needs_attention"].asBool());
  EXPECT_EQ(1U, json({"status"})["warnings"].size());
}

TEST_F(StatusTest, NamesEveryFullTableInOneLine) {
  addClient('c');
  addCode('k');
  writeSettings(R"({"client_info_max": 1, "grantcode_max": 1})");
  EXPECT_EQ(
      "oauthctl: clients are 100 % full, 1 of 1 or raise client_info_max; codes are 100 % full, 1 "
      "of 1, expired ones count (0): purge them or raise grantcode_max\n",
      run({"status"}).err);
}

// The log trims itself at its ceiling, so a full log is normal.
TEST_F(StatusTest, NeverWarnsAboutTheLog) {
  addClient('c');
  writeSettings(R"({"log_max": 1})");
  const Outcome outcome = run({"status"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, HasSubstr("log        1       1 100 %"));
}

TEST_F(StatusTest, ReportsAWrongSettingsFile) {
  addClient('c');
  for (const char* const text : {"{", "[1]", "", "{\"a\": \x01}"}) {
    writeSettings(text);
    EXPECT_THAT(run({"status"}).out, HasSubstr("JSON")) << text;
  }
}

}  // namespace
