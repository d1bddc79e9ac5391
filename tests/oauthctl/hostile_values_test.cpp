// Values that could control a terminal or break a JSON document.

#include <clocale>

#include "oauthctl_test.h"
#include "terminal/escaping.h"

using testing::HasSubstr;
using testing::Not;

namespace {

// Characters that change the direction of text, escaped so that they do not change this file's.
const std::string kOverride = {'\xE2', '\x80', '\xAE'}, kIsolate = {'\xE2', '\x81', '\xA6'};

const std::string kHostile =
    "\"\\ \n\r\t\x01\x1b[31m\x7f \xC2\x9B"
    "31m " +
    kOverride + " \xFF\xFE \xC3 \xED\xA0\x80 \xF4\x90\x80\x80 '\xC3\xA9 \xF0\x9F\x99\x82";

class HostileValuesTest : public OauthctlTest {
 protected:
  HostileValuesTest() {
    addClient('c');
    addToken('a');
    addCode('k');
    for (const char* const column : {"display_name", "redirect_uri", "scope", "client_secret"})
      plant("oauth_clientInfo", column, kHostile);
    for (const char* const column : {"username", "scope", "state", "flow_type", "ip", "client_id",
                                     "access_token", "refresh_token", "expired_time"})
      plant("oauth_token", column, kHostile);
    for (const char* const column :
         {"username", "scope", "state", "ip", "client_id", "code", "expired_time"})
      plant("oauth_grantCode", column, kHostile);
    plant("oauth_log", "msg", kHostile);
    execute("UPDATE oauth_meta SET tab_name = (SELECT msg FROM oauth_log) WHERE rowid = 1");
  }
};

const std::vector<Words> kReading = {
    {"status"},       {"check"},         {"client", "list"},     {"client", "show", "1"},
    {"code", "list"}, {"token", "list"}, {"token", "show", "1"}, {"log"}};

TEST_F(HostileValuesTest, AreEscapedInTables) {
  for (const Words& words : kReading)
    for (const bool show : {false, true}) {
      if (show && (words[0] == "log" || words[0] == "status" || words[0] == "check")) continue;
      Words all = words;
      if (show) all.emplace_back("--show-secrets");
      SCOPED_TRACE(words[0] + " " + words.back());
      const Outcome outcome = run(all);
      EXPECT_THAT(outcome.out, HasSubstr("\\x1b[31m"));
      EXPECT_THAT(outcome.out, HasSubstr("\\u202e"));
      EXPECT_THAT(outcome.out, HasSubstr("\\u009b"));
      EXPECT_THAT(outcome.out, HasSubstr("\\xff\\xfe"));
      for (const char* const bytes : {"\x1b", "\x01", "\x7f", "\r", "\t", "\xC2\x9B", "\xFF",
                                      "\xED\xA0", "\xF4\x90", kOverride.c_str()})
        EXPECT_THAT(outcome.out, Not(HasSubstr(bytes)));
    }
}

TEST_F(HostileValuesTest, StayValidJson) {
  for (const Words& words : kReading) {
    SCOPED_TRACE(words[0] + " " + words.back());
    json(words);
  }
  EXPECT_THAT(json({"log"})[0U]["msg"].asString(), HasSubstr("\x1b[31m"));
}

// JsonCpp's writer makes "\u0068" of the first two bytes.
TEST_F(HostileValuesTest, BecomeNoOtherLetterInJson) {
  plant("oauth_log", "msg", "\xC1\xA8 \xC3( \xFF");
  EXPECT_THAT(run({"log", "--json"}).out, HasSubstr(R"("msg": "\ufffd\ufffd \ufffd( \ufffd")"));
}

TEST_F(HostileValuesTest, AreEscapedInComplaints) {
  EXPECT_EQ("1 there is no token with --user \\x1b[2J\\n\\u202e",
            complaint(run({"token", "list", "--user", "\x1b[2J\n" + kOverride})));
}

TEST_F(HostileValuesTest, AreEscapedInQuestions) {
  const Outcome outcome = runOnTerminal({"client", "delete", "1"}, "n\n");
  EXPECT_THAT(outcome.out, HasSubstr("\\x1b[31m"));
  EXPECT_THAT(outcome.out, Not(HasSubstr("\x1b[31m")));
}

// A value that cannot be decrypted is shown as it is stored, and masked whatever its length.
TEST_F(HostileValuesTest, AreMaskedAsSecrets) {
  EXPECT_EQ("...", json({"client", "list"})[0U]["client_secret"].asString().substr(
                       json({"client", "list"})[0U]["client_secret"].asString().size() - 3));
  EXPECT_GE(8U, json({"token", "list"})[0U]["access_token"].asString().size());
}

// Tables that somebody replaced, so that ids can be texts. The library accepts them.
class HostileIdsTest : public HostileValuesTest {
 protected:
  HostileIdsTest() {
    execute("UPDATE oauth_clientInfo SET client_id = '" + FakeHost::sealed(times(64, 'c')) + "'");
    execute("UPDATE oauth_token SET access_token = '" + times(64, 'a') + "', expired_time = '" +
            std::to_string(kNow + 600) + "'");
    for (const char* const table :
         {"oauth_clientInfo", "oauth_token", "oauth_grantCode", "oauth_log", "oauth_meta"})
      forgetTypes(table);
    for (const char* const table :
         {"oauth_clientInfo", "oauth_token", "oauth_grantCode", "oauth_log"})
      plant(table, "id", kHostile);
    plant("oauth_log", "timestamp", kHostile);
    plant("oauth_clientInfo", "enable", kHostile);
    plant("oauth_meta", "tab_name", kHostile);
    plant("oauth_meta", "version", kHostile);
  }

  // Replaces the table by one with the same rows, but without types and keys.
  void forgetTypes(const std::string& table) const {
    std::string sql = "CREATE TABLE copy AS SELECT * FROM ";
    sql.append(table).append("; DROP TABLE ").append(table);
    execute(sql.append("; ALTER TABLE copy RENAME TO ").append(table));
  }

  // Expects only printable characters and line ends.
  static void expectPrintable(const std::string& text) {
    for (const char* const bytes : {"\x1b", "\x01", "\x7f", "\r", "\t", "\xC2\x9B", "\xFF",
                                    "\xED\xA0", "\xF4\x90", kOverride.c_str()})
      EXPECT_THAT(text, Not(HasSubstr(bytes)));
  }
};

std::vector<Words> everyCommand() {
  const std::string client = times(64, 'c');
  std::vector<Words> all = {
      {"client", "show", client},
      {"client", "edit", client, "--name", "x"},
      {"client", "enable", client},
      {"client", "disable", client},
      {"client", "delete", client, "--yes"},
      {"client", "delete", client, "--with-tokens", "--yes"},
      {"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r"},
      {"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r", "--json"},
      {"code", "list"},
      {"code", "list", "--user", kHostile},
      {"code", "revoke", "--user", kHostile, "--yes"},
      {"code", "purge", "--yes"},
      {"token", "list"},
      {"token", "list", "--user", kHostile},
      {"token", "show", "1"},
      {"token", "verify"},
      {"token", "verify", "--json"},
      {"token", "revoke", "--user", kHostile, "--yes"},
      {"token", "purge", "--grace", "0", "--yes"},
      {"log"},
      {"log", "--match", "31m"},
      {"backup", "/nonexistent/" + kHostile},
      {"restore", "/nonexistent/" + kHostile, "--yes"},
      {"status"},
      {"check"},
      {"client", "list"},
      {"log", "clear", "--yes"}};
  for (const char* const name : {"client", "code", "token"})
    for (const char* const form : {"--show-secrets", "--json"}) all.push_back({name, "list", form});
  for (const Words& words : {Words{"status", "--json"}, {"check", "--json"}, {"log", "--json"}})
    all.push_back(words);
  return all;
}

TEST_F(HostileIdsTest, AreEscapedByEveryCommand) {
  for (const Words& words : everyCommand()) {
    SCOPED_TRACE(words[0] + " " + (words.size() > 1 ? words[1] : ""));
    const Outcome outcome = run(words, times(64, 'a') + "\n");
    EXPECT_NE("", outcome.out + outcome.err);
    EXPECT_GT(4, outcome.code);
    expectPrintable(outcome.out);
    expectPrintable(outcome.err);
  }
}

TEST_F(HostileIdsTest, AreEscapedInQuestions) {
  for (const Words& words :
       {Words{"client", "delete", times(64, 'c')}, Words{"token", "revoke", "--user", kHostile},
        Words{"token", "purge", "--grace", "0"}}) {
    const std::string shown = runOnTerminal(words, "n\n").out;
    EXPECT_THAT(shown, Not(HasSubstr("\x1b[31m")));
    EXPECT_THAT(shown, Not(HasSubstr(kOverride)));
  }
}

// Such an id would be read as 0, which is the id of another row.
TEST_F(HostileIdsTest, ChangeNoOtherRow) {
  execute(
      "INSERT INTO oauth_clientInfo SELECT 'x', 'other', client_secret, redirect_uri, scope, "
      "display_name, 0 FROM oauth_clientInfo");
  const Lines before = everyRow();
  for (const char* const verb : {"enable", "disable", "delete"}) {
    Words words = {"client", verb, times(64, 'c')};
    if (words[1] == "delete") words.emplace_back("--yes");
    const std::string line = complaint(run(words));
    EXPECT_THAT(line, testing::StartsWith("1 nothing changed, the row's id '"));
    EXPECT_THAT(line, HasSubstr("is no number: see 'oauthctl check'"));
  }
  EXPECT_EQ(before, everyRow());
}

struct Text {
  std::string given, ascii, utf8;
};
void PrintTo(const Text& text, std::ostream* out) { *out << testing::PrintToString(text.ascii); }

class EscapingTest : public testing::TestWithParam<Text> {
 protected:
  ~EscapingTest() override { std::setlocale(LC_CTYPE, "C"); }
};

TEST_P(EscapingTest, EscapesUnprintableText) {
  std::setlocale(LC_CTYPE, "C");
  EXPECT_EQ(GetParam().ascii, oauthctl::escaped(GetParam().given));
  if (std::setlocale(LC_CTYPE, "C.UTF-8") == nullptr) return;
  EXPECT_EQ(GetParam().utf8, oauthctl::escaped(GetParam().given));
}

INSTANTIATE_TEST_SUITE_P(
    All, EscapingTest,
    testing::Values(Text{"", "", ""}, Text{"plain 'text'", "plain 'text'", "plain 'text'"},
                    Text{"\\x1b", "\\\\x1b", "\\\\x1b"}, Text{"\t\r\n", "\\t\\r\\n", "\\t\\r\\n"},
                    Text{std::string("\0\x1f\x7f", 3), "\\x00\\x1f\\x7f", "\\x00\\x1f\\x7f"},
                    Text{"\xC3\xA9", "\\u00e9", "\xC3\xA9"},
                    Text{"\xF0\x9F\x99\x82", "\\U0001f642", "\xF0\x9F\x99\x82"},
                    Text{"\xC2\x85\xC2\x9B", "\\u0085\\u009b", "\\u0085\\u009b"},
                    Text{kOverride + kIsolate + "\xEF\xBB\xBF", "\\u202e\\u2066\\ufeff",
                         "\\u202e\\u2066\\ufeff"},
                    Text{"\x80\xFF", "\\x80\\xff", "\\x80\\xff"}, Text{"\xC3", "\\xc3", "\\xc3"},
                    Text{"\xC0\xAF", "\\xc0\\xaf", "\\xc0\\xaf"},
                    Text{"\xE0\x80\xAF", "\\xe0\\x80\\xaf", "\\xe0\\x80\\xaf"},
                    Text{"\xED\xA0\x80", "\\xed\\xa0\\x80", "\\xed\\xa0\\x80"},
                    Text{"\xF4\x90\x80\x80", "\\xf4\\x90\\x80\\x80", "\\xf4\\x90\\x80\\x80"}));

}  // namespace
