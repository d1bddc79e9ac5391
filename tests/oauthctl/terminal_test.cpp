// Questions, colour and progress, with and without a terminal.

#include <clocale>

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

TEST_F(TerminalTest, AsksWhoseTheRowIs) {
  addClient('c');
  addToken('a');
  addCode('k', "bob");
  EXPECT_THAT(runOnTerminal({"token", "revoke", "--id", "1"}, "n\n").out,
              HasSubstr("Delete token 1 of alice for Photo album (1)? [y/N] "));
  EXPECT_THAT(runOnTerminal({"code", "revoke", "--id", "1"}, "n\n").out,
              HasSubstr("Delete code 1 of bob for Photo album (1)? [y/N] "));
}

// SQLite gives the number of a deleted row again.
TEST_F(TerminalTest, DeletesNoRowThatCameInPlaceOfTheOneShown) {
  addClient('c');
  addToken('a');
  addToken('b');
  beforeTyping_ = [this] {
    execute("DELETE FROM oauth_token WHERE id = 2");
    addToken('d', "mallory");
  };
  const Outcome outcome = runOnTerminal({"token", "revoke", "--id", "2"}, "y\n", "[y/N] ");
  EXPECT_EQ(1, outcome.code);
  EXPECT_THAT(outcome.out,
              HasSubstr("oauthctl: token 2 of alice for Photo album (1) was changed, replaced or "
                        "deleted meanwhile, nothing changed\r\n"));
  EXPECT_EQ((Lines{"1|alice", "2|mallory"}), query("SELECT id, username FROM oauth_token"));
}

TEST_F(TerminalTest, DeletesNoRowThatWasChangedMeanwhile) {
  addCode('k');
  beforeTyping_ = [this] { execute("UPDATE oauth_grantCode SET scope = 'write'"); };
  EXPECT_EQ(1, runOnTerminal({"code", "revoke", "--id", "1"}, "y\n", "[y/N] ").code);
  EXPECT_EQ(1, rowCount("oauth_grantCode"));
}

TEST_F(TerminalTest, DeletesNoClientThatCameInPlaceOfTheOneShown) {
  addClient('c');
  addToken('a');
  beforeTyping_ = [this] {
    execute("DELETE FROM oauth_clientInfo");
    addClient('d', "Printer");
  };
  const Outcome outcome =
      runOnTerminal({"client", "delete", "1", "--with-tokens"}, "y\n", "[y/N] ");
  EXPECT_EQ(1, outcome.code);
  EXPECT_THAT(outcome.out, HasSubstr("oauthctl: client 1, 'Photo album', was changed, replaced or "
                                     "deleted meanwhile, nothing changed\r\n"));
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
  EXPECT_EQ(1, rowCount("oauth_token"));
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

TEST_F(TerminalTest, ShowsWhatIsTypedAgainAfterASecret) {
  addToken('a');
  EXPECT_TRUE(runOnTerminal({"token", "verify"}, times(64, 'a') + "\n", "access token: ").echo);
  const Outcome interrupted = runOnTerminal({"token", "verify"}, "aaa\x03", "access token: ");
  EXPECT_EQ(128 + SIGINT, interrupted.code);
  EXPECT_TRUE(interrupted.echo);
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

TEST_F(TerminalTest, SendsNoEscapeSequencesWhereTheyAreNotWanted) {
  addExpiredTokens(700);
  for (const char* const variable : {"NO_COLOR=1", "TERM=dumb"}) {
    environment_ = {variable};
    EXPECT_THAT(runOnTerminal({"token", "list"}).out, Not(HasSubstr("\x1b"))) << variable;
  }
  const Outcome outcome = runOnTerminal({"token", "purge", "--grace", "0", "--yes"});
  EXPECT_EQ("deleted 700 tokens, 0 left\r\n", outcome.out);
}

TEST_F(TerminalTest, SendsOnlyAsciiWhereTheLocaleHasNothingElse) {
  addClient('c', "Caf\xC3\xA9");
  environment_ = {"LC_ALL=C"};
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr(" 1 Caf\\u00e9 yes "));
  // Not every system has UTF-8 at all.
  if (std::setlocale(LC_CTYPE, "C.UTF-8") == nullptr) return;
  std::setlocale(LC_CTYPE, "C");
  environment_ = {"LC_ALL=xx_XX.UTF-8"};  // a locale that is not installed
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr(" 1 Caf\xC3\xA9"));
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
