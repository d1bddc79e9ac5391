// Questions, colour and progress, with and without a terminal.

#include "oauthctl_test.h"

using testing::HasSubstr;
using testing::Not;

namespace {

constexpr char kEscape[] = "\x1b[";

class TerminalTest : public OauthctlTest {
 protected:
  // Adds this many expired tokens, most of them in one statement.
  void addExpiredTokens(int count) const {
    addToken('a', "alice", kNow - 1);
    execute(
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < " +
        std::to_string(count - 1) +
        ") INSERT INTO oauth_token SELECT username, client_id, scope, refresh_token, "
        "substr(access_token, 7) || printf('%06d', i), expired_time, flow_type, state, ip, NULL "
        "FROM oauth_token, n");
  }
};

TEST_F(TerminalTest, AsksBeforeItDeletes) {
  addToken('a');
  const Outcome refused = runOnTerminal({"token", "revoke", "--user", "alice"}, "n\n");
  EXPECT_EQ(1, refused.code);
  EXPECT_THAT(refused.out, HasSubstr("Delete 1 token with --user alice? [y/N] "));
  EXPECT_THAT(refused.out, HasSubstr("oauthctl: not confirmed, nothing changed"));
  EXPECT_EQ(1, rowCount("oauth_token"));
  const Outcome agreed = runOnTerminal({"token", "revoke", "--user", "alice"}, "y\n");
  EXPECT_EQ(0, agreed.code);
  EXPECT_THAT(agreed.out, HasSubstr("deleted 1 token"));
  EXPECT_EQ(0, rowCount("oauth_token"));
}

TEST_F(TerminalTest, TakesAnEmptyAnswerForNo) {
  addToken('a');
  EXPECT_EQ(1, runOnTerminal({"token", "revoke", "--user", "alice"}, "\n").code);
  EXPECT_EQ(1, runOnTerminal({"token", "revoke", "--user", "alice"}, "\x04").code);
  EXPECT_EQ(1, rowCount("oauth_token"));
}

TEST_F(TerminalTest, DoesNotAskWithYes) {
  addToken('a');
  const Outcome outcome = runOnTerminal({"token", "revoke", "--id", "1", "--yes"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, Not(HasSubstr("[y/N]")));
}

TEST_F(TerminalTest, AsksBeforeItRestores) {
  addToken('a');
  ASSERT_EQ(0, run({"backup", path("copy.db")}).code);
  addToken('b');
  const Outcome refused = runOnTerminal({"restore", path("copy.db")}, "no\n");
  EXPECT_EQ(1, refused.code);
  EXPECT_THAT(refused.out, HasSubstr("Replace everything in the database by 0 clients, 0 codes, 1 "
                                     "token, 0 log lines? [y/N]"));
  EXPECT_EQ(2, rowCount("oauth_token"));
  EXPECT_EQ(0, runOnTerminal({"restore", path("copy.db")}, "yes\n").code);
  EXPECT_EQ(1, rowCount("oauth_token"));
}

TEST_F(TerminalTest, ReadsATokenWithoutEcho) {
  addToken('a');
  const Outcome outcome =
      runOnTerminal({"token", "verify"}, times(64, 'a') + "\n", "access token: ");
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, HasSubstr("access token: \r\nid "));
}

TEST_F(TerminalTest, ColoursTables) {
  addClient('c');
  EXPECT_THAT(runOnTerminal({"client", "list"}).out, HasSubstr(kEscape));
  EXPECT_THAT(run({"client", "list"}).out, Not(HasSubstr(kEscape)));
}

TEST_F(TerminalTest, ObeysNoColor) {
  addClient('c');
  environment_ = {"NO_COLOR=1"};
  EXPECT_THAT(runOnTerminal({"client", "list"}).out, Not(HasSubstr(kEscape)));
  environment_ = {"NO_COLOR="};
  EXPECT_THAT(runOnTerminal({"client", "list"}).out, HasSubstr(kEscape));
}

TEST_F(TerminalTest, ShowsProgressOfLongWork) {
  addExpiredTokens(700);
  const Outcome outcome = runOnTerminal({"token", "purge", "--grace", "0", "--yes"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, HasSubstr("\rdeleting tokens: 1 of 700"));
  EXPECT_THAT(outcome.out, HasSubstr("\r\x1b[Kdeleted 700 tokens, 0 left"));
}

TEST_F(TerminalTest, ShowsNoProgressWithoutATerminal) {
  addExpiredTokens(700);
  const Outcome outcome = run({"token", "purge", "--grace", "0", "--yes"});
  EXPECT_EQ("deleted 700 tokens, 0 left\n", outcome.out);
  EXPECT_EQ("", outcome.err);
}

TEST_F(TerminalTest, ShowsNoProgressOfShortWork) {
  addExpiredTokens(100);
  EXPECT_THAT(runOnTerminal({"token", "purge", "--grace", "0", "--yes"}).out,
              Not(HasSubstr("deleting")));
}

}  // namespace
