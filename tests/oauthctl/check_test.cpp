// Each test makes one kind of damage, and expects exactly that finding.

#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <fstream>

#include "oauthctl_test.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;

namespace {

// Changes more than fits into the cache: pages and journal reach the disk before the transaction
// ends.
constexpr char kLargeChange[] =
    "PRAGMA cache_size = 1; BEGIN; UPDATE oauth_token SET scope = 'changed';"
    "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 500) "
    "INSERT INTO oauth_log SELECT i, hex(zeroblob(500)), NULL FROM n";

class CheckTest : public OauthctlTest {
 protected:
  CheckTest() {
    addClient('c');
    addToken('a');
    addCode('k');
    chmod(files_.database().c_str(), 0600);
    chmod(files_.directory().c_str(), 0700);
  }

  // The problems found. Expects the same in both forms, and that the check changes nothing.
  Lines findings() const {
    const std::string before = databaseBytes();
    const Outcome outcome = run({"check"});
    Lines problems;
    for (const Json::Value& finding : json({"check"})) {
      problems.push_back(finding["problem"].asString());
      EXPECT_NE("", finding["advice"].asString());
    }
    EXPECT_EQ(static_cast<std::size_t>(std::count(outcome.out.begin(), outcome.out.end(), '\n')),
              problems.empty() ? 1 : problems.size());
    EXPECT_EQ(problems.empty() ? 0 : 1, outcome.code);
    const std::string count = std::to_string(problems.size());
    EXPECT_EQ(problems.empty()       ? ""
              : problems.size() == 1 ? "oauthctl: 1 finding\n"
                                     : "oauthctl: " + count + " findings\n",
              outcome.err);
    EXPECT_EQ(before, databaseBytes());
    return problems;
  }

  void changeSchema(const std::string& sql) const {
    execute("PRAGMA writable_schema = ON;" + sql + ";PRAGMA schema_version = 4711");
  }
  // Bytes of the file, from the end backwards if the offset is negative.
  void overwrite(long offset, const std::string& bytes) const {
    std::fstream file(files_.database(), std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(offset, offset < 0 ? std::ios::end : std::ios::beg);
    file << bytes;
  }
};

TEST_F(CheckTest, FindsNothingInASoundDatabase) {
  EXPECT_THAT(findings(), ElementsAre());
  EXPECT_EQ("sound: " + files_.database() + "\n", run({"check"}).out);
  EXPECT_EQ("[]\n", run({"check", "--json"}).out);
}

TEST_F(CheckTest, FindsADamagedPage) {
  const long page = 4096;
  for (long at = page; at < static_cast<long>(databaseBytes().size()); at += page)
    overwrite(at + 8, times(64, '\x7f'));
  EXPECT_THAT(findings(), testing::Contains(testing::AnyOf(StartsWith("integrity check: "),
                                                           StartsWith("cannot be read: "))));
}

TEST_F(CheckTest, FindsAnIndexThatMissesARow) {
  changeSchema(
      "UPDATE sqlite_master SET rootpage = (SELECT rootpage FROM sqlite_master WHERE name = "
      "'sqlite_autoindex_oauth_grantCode_1') WHERE name = 'sqlite_autoindex_oauth_token_1'");
  EXPECT_THAT(findings(), testing::Contains(HasSubstr("integrity check: ")));
}

TEST_F(CheckTest, FindsAFileThatIsNoDatabase) {
  overwrite(0, "no database at all");
  EXPECT_THAT(findings(), ElementsAre("cannot be read: file is not a database"));
}

TEST_F(CheckTest, FindsATruncatedFile) {
  ASSERT_EQ(0, truncate(files_.database().c_str(), 4096));
  EXPECT_THAT(findings(), testing::Not(ElementsAre()));
}

TEST_F(CheckTest, FindsAMissingTable) {
  execute("DROP TABLE oauth_log");
  EXPECT_THAT(findings(), ElementsAre("table oauth_log is missing"));
}

// Even one more blank in a definition is a finding.
TEST_F(CheckTest, FindsEachDifferentDefinition) {
  for (const std::string table :
       {"oauth_meta", "oauth_clientInfo", "oauth_token", "oauth_grantCode", "oauth_log"}) {
    const std::string where = std::string(" WHERE name = '").append(table).append("'");
    changeSchema("UPDATE sqlite_master SET sql = replace(sql, '(', '( ')" + where);
    EXPECT_THAT(findings(), ElementsAre(StartsWith(std::string("table ").append(table).append(
                                " is defined differently"))));
    changeSchema("UPDATE sqlite_master SET sql = replace(sql, '( ', '(')" + where);
  }
}

TEST_F(CheckTest, DecryptsNoColumnThatSomebodyAdded) {
  execute("ALTER TABLE oauth_token ADD COLUMN client_secret TEXT DEFAULT 'plain'");
  EXPECT_THAT(findings(), ElementsAre(StartsWith("table oauth_token is defined differently")));
}

TEST_F(CheckTest, FindsUnknownObjects) {
  execute("CREATE TRIGGER spy AFTER INSERT ON oauth_token BEGIN SELECT 1; END");
  execute("CREATE TABLE extra(a)");
  execute("CREATE INDEX fast ON oauth_token(username)");
  EXPECT_THAT(findings(),
              ElementsAre("unknown trigger spy", "unknown table extra", "unknown index fast"));
}

TEST_F(CheckTest, FindsAnotherJournalMode) {
  execute("PRAGMA journal_mode = wal");
  EXPECT_EQ("journal mode is wal, not delete", json({"check"})[0U]["problem"].asString());
}

TEST_F(CheckTest, FindsAMissingVersion) {
  execute("DELETE FROM oauth_meta WHERE tab_name = 'oauth_token'");
  EXPECT_THAT(findings(), ElementsAre("schema version of oauth_token stands there 0 times"));
}

TEST_F(CheckTest, FindsADoubledVersion) {
  execute("INSERT INTO oauth_meta VALUES('oauth_token', 2)");
  EXPECT_THAT(findings(), ElementsAre("schema version of oauth_token stands there 2 times"));
}

TEST_F(CheckTest, FindsAnotherVersion) {
  execute("UPDATE oauth_meta SET version = 3 WHERE tab_name = 'oauth_grantCode'");
  EXPECT_THAT(findings(), ElementsAre("schema version of oauth_grantCode is 3, not 2"));
}

TEST_F(CheckTest, FindsAVersionOfAnUnknownTable) {
  execute("INSERT INTO oauth_meta VALUES('oauth_x', 2)");
  EXPECT_THAT(findings(), ElementsAre("schema version of an unknown table oauth_x"));
}

TEST_F(CheckTest, FindsEachValueThatDoesNotDecrypt) {
  for (const char* const place :
       {"client_id in oauth_clientInfo", "client_secret in oauth_clientInfo",
        "client_id in oauth_grantCode", "client_id in oauth_token"}) {
    const std::string text = place, column = text.substr(0, text.find(' ')),
                      table = text.substr(text.rfind(' ') + 1);
    const std::string before =
        query(std::string("SELECT ").append(column).append(" FROM ") + table).front();
    plant(table, column, "not sealed");
    EXPECT_THAT(findings(), ElementsAre(text + " does not decrypt: row 1"));
    plant(table, column, before);
  }
}

TEST_F(CheckTest, NamesTheFirstRowsOnly) {
  for (const char token : {'1', '2', '3', '4', '5', '6'}) addToken(token);
  plant("oauth_token", "client_id", "not sealed");
  EXPECT_THAT(findings(), ElementsAre("client_id in oauth_token does not decrypt: rows 1, 2, 3, "
                                      "4, 5 and 2 more"));
}

TEST_F(CheckTest, FindsExpiriesThatAreNoNumbers) {
  for (const std::string value : {"never", "", "12 ", "+5", "1.5"}) {
    plant("oauth_token", "expired_time", value);
    EXPECT_THAT(findings(), ElementsAre("expired_time in oauth_token is no number: row 1"))
        << value;
  }
  plant("oauth_token", "expired_time", "99999999999999999999");
  EXPECT_THAT(findings(), ElementsAre());
  plant("oauth_grantCode", "expired_time", "x");
  EXPECT_THAT(findings(), ElementsAre("expired_time in oauth_grantCode is no number: row 1"));
}

TEST_F(CheckTest, FindsAFileOpenToOthers) {
  for (const mode_t mode : {0644, 0660, 0602, 0604}) {
    chmod(files_.database().c_str(), mode);
    EXPECT_THAT(findings(), ElementsAre(StartsWith(files_.database() + " has mode 0")));
  }
  chmod(files_.database().c_str(), 0640);
  EXPECT_THAT(findings(), ElementsAre());
}

TEST_F(CheckTest, FindsAFolderOpenToOthers) {
  giveToNobody();  // root refuses to work in such a folder of its own
  for (const mode_t mode : {0777, 0770, 0702}) {
    chmod(files_.directory().c_str(), mode);
    EXPECT_THAT(findings(), ElementsAre(HasSubstr("others can replace the database")));
  }
}

TEST_F(CheckTest, FindsAFileOfAnotherUser) {
  if (getuid() != 0) GTEST_SKIP() << "only root can give files away";
  ASSERT_EQ(0, chown(files_.database().c_str(), 1234, 1234));
  EXPECT_THAT(findings(),
              ElementsAre(files_.database() + " belongs to user 1234 and its folder to user 0"));
}

TEST_F(CheckTest, FindsAHardLink) {
  ASSERT_EQ(0, link(files_.database().c_str(), path("other.db").c_str()));
  EXPECT_THAT(findings(), ElementsAre(files_.database() + " has other names too (1)"));
}

// Makes a real one: the process dies after it has written pages and before its transaction ends.
TEST_F(CheckTest, FindsAJournalLeftOverWithoutTouchingIt) {
  const std::string journal = files_.database() + "-journal", sound = databaseBytes();
  const pid_t child = fork();
  if (child == 0) {
    sqlite3* db = nullptr;
    sqlite3_open_v2(files_.database().c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    sqlite3_exec(db, kLargeChange, nullptr, nullptr, nullptr);
    kill(getpid(), SIGKILL);
  }
  waitpid(child, nullptr, 0);
  ASSERT_NE(sound, databaseBytes());
  const std::string left = bytesOf(journal);
  ASSERT_NE("", left);
  EXPECT_THAT(findings(), ElementsAre(StartsWith(journal + " is left over, of user ")));
  EXPECT_EQ(left, bytesOf(journal));
  // The advice helps.
  EXPECT_EQ(0, run({"status"}).code);
  EXPECT_THAT(findings(), ElementsAre());
  EXPECT_EQ(sound, databaseBytes());
}

// A server holds a lock while it changes the database, so its journal is not a finding.
TEST_F(CheckTest, IgnoresAJournalInUse) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(files_.database().c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
  sqlite3_exec(db, kLargeChange, nullptr, nullptr, nullptr);
  EXPECT_NE('\0', bytesOf(files_.database() + "-journal")[0]);
  EXPECT_EQ("3 the database is busy, try again", complaint(run({"check"})));
  sqlite3_close_v2(db);
  EXPECT_THAT(findings(), ElementsAre());
}

TEST_F(CheckTest, IgnoresAnEmptiedJournal) {
  std::ofstream(files_.database() + "-journal", std::ios::binary) << times(100, '\0');
  EXPECT_THAT(findings(), ElementsAre());
}

TEST_F(CheckTest, FindsWrongSettings) {
  writeSettings(R"({"token_max": "7", "log_max": 20000, "tokenmax": 5, "token_expired": -1})");
  chmod(files_.settings().c_str(), 0600);
  EXPECT_THAT(findings(),
              ElementsAre("setting token_max: wrong type in the file, default 1000 applies",
                          "setting log_max: clamped from 20000 10000 applies",
                          "setting token_expired: below 1 in the file, default 600 applies",
                          "setting tokenmax is unknown"));
}

TEST_F(CheckTest, FindsASettingsFileThatIsNoJson) {
  writeSettings("token_max = 7");
  chmod(files_.settings().c_str(), 0600);
  EXPECT_THAT(findings(), ElementsAre(files_.settings() + " is not JSON, every default applies"));
}

// The library refuses the whole file, so its values must not be shown as those in force.
TEST_F(CheckTest, RefusesSettingsThatTheLibraryRefuses) {
  writeSettings(R"({"token_max": 50,})");
  chmod(files_.settings().c_str(), 0600);
  EXPECT_THAT(findings(), ElementsAre(files_.settings() + " is not JSON, every default applies"));
  const Json::Value value = json({"status", "--json"})["settings"]["values"]["token_max"];
  EXPECT_EQ(1000, value["value"].asInt());
  EXPECT_EQ("default", value["from"].asString());
}

TEST_F(CheckTest, FindsAPipeInPlaceOfTheSettings) {
  ASSERT_EQ(0, mkfifo(files_.settings().c_str(), 0600));
  EXPECT_THAT(findings(),
              ElementsAre(files_.settings() + " is not a regular file, every default applies"));
}

TEST_F(CheckTest, FindsSettingsThatAreTooLarge) {
  writeSettings("{" + times(1024 * 1024, ' ') + "}");
  chmod(files_.settings().c_str(), 0600);
  EXPECT_THAT(findings(), ElementsAre(files_.settings() +
                                      " is larger than 1048576 bytes, every default applies"));
}

TEST_F(CheckTest, FindsSettingsThatOthersMayWrite) {
  writeSettings("{}");
  chmod(files_.settings().c_str(), 0666);
  EXPECT_THAT(findings(), ElementsAre(files_.settings() + " has mode 0666, others may write it"));
}

TEST_F(CheckTest, FindsDiagnosticsLeftOn) {
  writeSettings("{\"log_level\": 15}");
  chmod(files_.settings().c_str(), 0600);
  createDebugMarker();
  EXPECT_THAT(findings(), ElementsAre("diagnostics are on and write secrets to the system log"));
}

}  // namespace
