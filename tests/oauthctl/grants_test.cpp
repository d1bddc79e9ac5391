// Codes and tokens.

#include "oauthctl_test.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

namespace {

class GrantsTest : public OauthctlTest {
 protected:
  Lines tokensLeft() const {
    return query("SELECT substr(access_token, 1, 1) FROM oauth_token ORDER BY id");
  }
  Lines codesLeft() const {
    return query("SELECT substr(code, 1, 1) FROM oauth_grantCode ORDER BY id");
  }
};

TEST_F(GrantsTest, ListsTokensAsATable) {
  addClient('c');
  addToken('a');
  addToken('b', "bob", kNow - 3 * kDay, 'd');
  EXPECT_EQ(
      "ID USER  CLIENT          SCOPE IP        EXPIRES\n"
      " 1 alice Photo album (1) read  192.0.2.7 in 10 min\n"
      " 2 bob   not registered  read  192.0.2.7 3 days ago\n",
      run({"token", "list"}).out);
  EXPECT_EQ(run({"token", "list", "--user", "bob"}).out,
            run({"token", "list", "--client", times(64, 'd')}).out);
}

TEST_F(GrantsTest, ListsTokensAsJson) {
  addClient('c');
  addToken('a');
  const Json::Value tokens = json({"token", "list"});
  ASSERT_EQ(1U, tokens.size());
  const Json::Value& token = tokens[0U];
  EXPECT_EQ(1, token["id"].asInt());
  EXPECT_EQ("alice", token["username"].asString());
  EXPECT_EQ(times(64, 'c'), token["client_id"].asString());
  EXPECT_EQ(1, token["client"].asInt());
  EXPECT_EQ(kNow + 600, token["expired_time"].asInt64());
  EXPECT_FALSE(token["expired"].asBool());
  EXPECT_EQ("aaaa...", token["access_token"].asString());
  EXPECT_EQ("rrrr...", token["refresh_token"].asString());
  EXPECT_EQ("code", token["flow_type"].asString());
}

TEST_F(GrantsTest, ListsCodesInBothForms) {
  addClient('c');
  addCode('k');
  EXPECT_EQ(
      "ID USER  CLIENT          SCOPE IP        EXPIRES\n"
      " 1 alice Photo album (1) read  192.0.2.7 in 10 min\n",
      run({"code", "list"}).out);
  EXPECT_EQ("kkkk...", json({"code", "list"})[0U]["code"].asString());
  EXPECT_THAT(run({"code", "list", "--show-secrets"}).out, HasSubstr(times(64, 'k')));
}

TEST_F(GrantsTest, ShowsTokensOnRequestOnly) {
  addToken('a');
  for (const Words& words : {Words{"token", "list"}, Words{"token", "show", "1"}})
    for (const bool asJson : {false, true}) {
      Words all = words;
      if (asJson) all.emplace_back("--json");
      const std::string masked = run(all).out;
      EXPECT_THAT(masked, Not(HasSubstr("aaaaa")));
      EXPECT_THAT(masked, Not(HasSubstr("rrrrr")));
      all.emplace_back("--show-secrets");
      const std::string open = run(all).out;
      EXPECT_THAT(open, HasSubstr(times(64, 'a')));
      EXPECT_THAT(open, HasSubstr(times(64, 'r')));
    }
}

TEST_F(GrantsTest, ShowsOneToken) {
  addClient('c');
  addToken('a');
  EXPECT_EQ(
      "id            1\n"
      "user          alice\n"
      "client        Photo album (1)\n"
      "client_id     " +
          times(64, 'c') +
          "\n"
          "scope         read\n"
          "state         xyz\n"
          "flow_type     code\n"
          "ip            192.0.2.7\n"
          "expires       in 10 min\n"
          "access_token  aaaa...\n"
          "refresh_token rrrr...\n",
      run({"token", "show", "1"}).out);
  EXPECT_EQ("1 there is no token 2", complaint(run({"token", "show", "2"})));
}

TEST_F(GrantsTest, ReportsThatNothingMatches) {
  addToken('a');
  execute("DELETE FROM oauth_token");
  EXPECT_EQ("no tokens\n", run({"token", "list"}).out);
  EXPECT_EQ("no codes\n", run({"code", "list"}).out);
  EXPECT_EQ("1 there is no token with --user bob",
            complaint(run({"token", "list", "--user", "bob"})));
  const Outcome outcome = run({"token", "list", "--user", "bob", "--json"});
  EXPECT_EQ("[]\n", outcome.out);
  EXPECT_EQ(1, outcome.code);
  EXPECT_EQ("1 there is no token with --id 3",
            complaint(run({"token", "revoke", "--id", "3", "--yes"})));
}

// The stores double a quote, but some edits store it as it is.
TEST_F(GrantsTest, FindsUsersWithQuotesInTheirNames) {
  addToken('a', "O'Brien");
  addToken('b', "plain");
  plant("oauth_token", "username", "O'Brien");
  addToken('d', "O'Brien");
  EXPECT_EQ(3U, json({"token", "list", "--user", "O'Brien"}).size());
  EXPECT_EQ("O'Brien", json({"token", "list", "--id", "3"})[0U]["username"].asString());
  EXPECT_EQ("deleted 3 tokens\n", run({"token", "revoke", "--user", "O'Brien", "--yes"}).out);
}

TEST_F(GrantsTest, VerifiesATokenFromStandardInput) {
  addClient('c');
  addToken('a');
  const Outcome outcome = run({"token", "verify"}, times(64, 'a') + "\n");
  EXPECT_EQ(0, outcome.code);
  EXPECT_EQ("", outcome.err);
  EXPECT_THAT(outcome.out, HasSubstr("user          alice\n"));
  EXPECT_THAT(outcome.out, Not(HasSubstr("aaaaa")));
}

TEST_F(GrantsTest, VerifiesInJson) {
  addClient('c');
  addToken('a');
  const Outcome valid = run({"token", "verify", "--json"}, times(64, 'a'));
  EXPECT_EQ(0, valid.code);
  EXPECT_THAT(valid.out, HasSubstr("\"valid\": true"));
  const Outcome unknown = run({"token", "verify", "--json"}, times(64, 'b'));
  EXPECT_EQ(1, unknown.code);
  EXPECT_EQ("{\n  \"token\": null,\n  \"valid\": false\n}\n", unknown.out);
}

TEST_F(GrantsTest, DistinguishesExpiredFromUnknown) {
  addToken('a', "alice", kNow - 1);
  EXPECT_EQ("1 not valid: it expired 1 s ago",
            complaint(run({"token", "verify"}, times(64, 'a') + "\n")));
  EXPECT_EQ("1 not valid: no such access token",
            complaint(run({"token", "verify"}, times(64, 'b') + "\n")));
  EXPECT_EQ("1 not valid: no such access token", complaint(run({"token", "verify"}, "short\n")));
  EXPECT_EQ("2 standard input holds no access token", complaint(run({"token", "verify"})));
  EXPECT_EQ("2 the access token on standard input holds a NUL byte",
            complaint(run({"token", "verify"}, times(64, 'a') + '\0' + "\n")));
}

TEST_F(GrantsTest, RevokesByUser) {
  addToken('a');
  addToken('b', "bob");
  addToken('d');
  EXPECT_EQ("deleted 2 tokens\n", run({"token", "revoke", "--user", "alice", "--yes"}).out);
  EXPECT_THAT(tokensLeft(), ElementsAre("b"));
}

TEST_F(GrantsTest, RevokesByClientNumber) {
  addClient('c');
  addClient('d');
  addToken('a');
  addToken('b', "bob", kNow, 'd');
  EXPECT_EQ("deleted 1 token\n", run({"token", "revoke", "--client", "2", "--yes"}).out);
  EXPECT_THAT(tokensLeft(), ElementsAre("a"));
}

TEST_F(GrantsTest, RevokesByNumber) {
  addToken('a');
  addToken('b');
  EXPECT_EQ("deleted 1 token\n", run({"token", "revoke", "--id", "2", "--yes"}).out);
  EXPECT_THAT(tokensLeft(), ElementsAre("a"));
}

// The library's own revocation would leave a code valid for the rest of the second.
TEST_F(GrantsTest, DeletesRevokedCodes) {
  addCode('k');
  addCode('l', "bob");
  EXPECT_EQ("deleted 1 code\n", run({"code", "revoke", "--user", "alice", "--yes"}).out);
  EXPECT_THAT(codesLeft(), ElementsAre("l"));
}

TEST_F(GrantsTest, RevokesNothingWithoutConfirmation) {
  addToken('a');
  EXPECT_EQ("2 nobody is there to ask \"Delete 1 token with --user alice?\": add --yes",
            complaint(run({"token", "revoke", "--user", "alice"})));
  EXPECT_THAT(tokensLeft(), ElementsAre("a"));
}

TEST_F(GrantsTest, PurgesWhatExpiredLongAgo) {
  addToken('a', "alice", kNow - 30 * kDay);
  addToken('b', "alice", kNow - 30 * kDay - 1);
  addToken('d', "alice", kNow - 1);
  EXPECT_EQ("would delete 1 token of 3, expired more than 30 days ago\n",
            run({"token", "purge", "--dry-run"}).out);
  EXPECT_EQ(3, rowCount("oauth_token"));
  EXPECT_EQ("deleted 1 token, 2 left\n", run({"token", "purge", "--yes"}).out);
  EXPECT_THAT(tokensLeft(), ElementsAre("a", "d"));
  EXPECT_EQ("nothing to delete: 0 tokens of 2, expired more than 30 days ago\n",
            run({"token", "purge"}).out);
}

TEST_F(GrantsTest, PurgesWithTheGraceGiven) {
  addToken('a', "alice", kNow - 3600);
  addToken('b', "alice", kNow - 3601);
  addToken('d', "alice", kNow);
  EXPECT_EQ("deleted 1 token, 2 left\n", run({"token", "purge", "--grace", "60m", "--yes"}).out);
  EXPECT_EQ("deleted 1 token, 1 left\n", run({"token", "purge", "--grace", "0", "--yes"}).out);
  EXPECT_THAT(tokensLeft(), ElementsAre("d"));
}

TEST_F(GrantsTest, PurgesEveryExpiredCode) {
  addCode('k', "alice", kNow - 1);
  addCode('l', "alice", kNow);
  plant("oauth_token", "expired_time", "never");
  EXPECT_EQ("2 nobody is there to ask \"Delete 1 code of 2, expired?\": add --yes",
            complaint(run({"code", "purge"})));
  EXPECT_EQ("deleted 1 code, 1 left\n", run({"code", "purge", "--yes"}).out);
  EXPECT_THAT(codesLeft(), ElementsAre("l"));
}

TEST_F(GrantsTest, ShowsAnExpiryThatIsNoNumber) {
  addToken('a');
  plant("oauth_token", "expired_time", "never");
  EXPECT_THAT(run({"token", "list"}).out, HasSubstr("no number: 'never'"));
  EXPECT_TRUE(json({"token", "list"})[0U]["expired_time"].isNull());
}

}  // namespace
