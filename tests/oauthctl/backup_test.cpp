// Backup and restore.

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <fstream>

#include "oauthctl_test.h"

using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::SizeIs;
using testing::StartsWith;
using namespace ZEVOOAUTHSERVER;

namespace {

class BackupTest : public OauthctlTest {
 protected:
  BackupTest() { chmod(files_.directory().c_str(), 0700); }

  Lines fileNames() const {
    Lines names;
    for (const auto& entry : std::filesystem::directory_iterator(files_.directory()))
      names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    return names;
  }
  static mode_t modeOf(const std::string& file) {
    struct stat status = {};
    EXPECT_EQ(0, stat(file.c_str(), &status)) << file;
    return status.st_mode & 07777U;
  }

  const std::string copy_ = path("copy.db");
};

TEST_F(BackupTest, CopiesEveryRow) {
  addClient('c');
  addToken('a');
  addCode('k');
  const Outcome outcome = run({"backup", copy_});
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_EQ("wrote " + copy_ + ": 1 client, 1 code, 1 token, 1 log line\n", outcome.out);
  EXPECT_EQ(rowsIn(files_.database()), rowsIn(copy_));
  EXPECT_EQ(0600U, modeOf(copy_));
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "oauth.db"));
}

TEST_F(BackupTest, CopiesNoDeletedRow) {
  addClient('c');
  addToken('7');
  execute("PRAGMA secure_delete = OFF; DELETE FROM oauth_token");
  ASSERT_THAT(databaseBytes(), HasSubstr(times(64, '7')));
  EXPECT_EQ(0, run({"backup", copy_}).code);
  EXPECT_THAT(bytesOf(copy_), Not(HasSubstr(times(8, '7'))));
}

TEST_F(BackupTest, DoesNotChangeTheSource) {
  addClient('c');
  const std::string before = databaseBytes();
  chmod(files_.database().c_str(), 0400);
  EXPECT_EQ(0, run({"backup", copy_}).code);
  EXPECT_EQ(before, databaseBytes());
}

TEST_F(BackupTest, NeverReplacesAFile) {
  addClient('c');
  std::ofstream(copy_) << "precious";
  EXPECT_EQ("2 " + copy_ + " exists, and no file is ever replaced",
            complaint(run({"backup", copy_})));
  EXPECT_EQ("precious", bytesOf(copy_));
  ASSERT_EQ(0, symlink("/nonexistent/target", path("link.db").c_str()));
  EXPECT_EQ("2 " + path("link.db") + " exists, and no file is ever replaced",
            complaint(run({"backup", path("link.db")})));
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "link.db", "oauth.db"));
}

TEST_F(BackupTest, ReportsThatItCannotWrite) {
  addClient('c');
  EXPECT_EQ("1 cannot make a file beside /nonexistent/copy.db: No such file or directory",
            complaint(run({"backup", "/nonexistent/copy.db"})));
}

// Such a copy would not fit into memory, and could not be restored.
TEST_F(BackupTest, RefusesADatabaseThatIsTooLarge) {
  addClient('c');
  std::fstream file(files_.database(), std::ios::in | std::ios::out | std::ios::binary);
  file.seekp(28);  // the number of pages: one more than fits into 512 MiB
  file.write("\x00\x02\x00\x01", 4);
  file.close();
  ASSERT_EQ(0, truncate(files_.database().c_str(), 131073LL * 4096));
  EXPECT_EQ(
      "3 cannot read the database (it is too large for a database of the server), no backup "
      "was made: see 'oauthctl check'",
      complaint(run({"backup", copy_})));
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
}

TEST_F(BackupTest, RefusesADamagedDatabase) {
  addClient('c');
  execute("DROP TABLE oauth_log");
  EXPECT_EQ(
      "1 the database is not sound, no backup was made: table oauth_log is missing; see 'oauthctl "
      "check'",
      complaint(run({"backup", copy_})));
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
}

TEST_F(BackupTest, LeavesNoTokenBytesOnRequest) {
  addClient('c');
  for (const char c : {'1', '2', '3', '4'}) {
    addToken(c);
    addCode(c);
  }
  execute("DELETE FROM oauth_token WHERE id = 2; DELETE FROM oauth_grantCode WHERE id = 2");
  ASSERT_EQ(0, run({"backup", path("all.db")}).code);
  ASSERT_THAT(bytesOf(path("all.db")), HasSubstr(times(64, '1')));
  EXPECT_EQ("wrote " + copy_ + ": 1 client, 0 codes, 0 tokens, 1 log line\n",
            run({"backup", copy_, "--without-tokens"}).out);
  const std::string bytes = bytesOf(copy_);
  for (const char c : {'1', '2', '3', '4', 'r'}) EXPECT_THAT(bytes, Not(HasSubstr(times(8, c))));
  EXPECT_THAT(bytes, Not(HasSubstr("alice")));
  EXPECT_EQ("1", queryIn(copy_, "SELECT COUNT(*) FROM oauth_clientInfo").front());
  EXPECT_EQ("ok", queryIn(copy_, "PRAGMA integrity_check").front());
}

// Four processes issue tokens. Each notes a token after the library has returned it.
class IssuingTest : public BackupTest {
 protected:
  IssuingTest() {
    writeSettings(R"({"token_max": 10000})");
    addClient('c');
    EXPECT_EQ(0, run({"backup", copy_}).code);
    files_.waitForLocks();
    for (int n = 0; n < kIssuers; ++n) {
      const pid_t child = fork();
      if (child == 0) issue(notes(n));
      issuers_.push_back(child);
    }
    while (acknowledged().size() < 20) usleep(1000);
  }
  ~IssuingTest() override { stop(); }

  void stop() {
    for (const pid_t issuer : issuers_) kill(issuer, SIGKILL);
    for (const pid_t issuer : issuers_) waitpid(issuer, nullptr, 0);
    issuers_.clear();
  }
  Lines acknowledged() const {
    Lines tokens;
    for (int n = 0; n < kIssuers; ++n) {
      std::istringstream noted(bytesOf(notes(n)));
      for (std::string line; std::getline(noted, line) && line.size() == 64;)
        tokens.push_back(line);
    }
    return tokens;
  }
  static void expectAll(const Lines& tokens, const Lines& found) {
    for (const std::string& token : tokens)
      EXPECT_EQ(1, std::count(found.begin(), found.end(), token)) << token;
  }
  static Lines tokensIn(const std::string& file) {
    return queryIn(file, "SELECT access_token FROM oauth_token");
  }

 private:
  static constexpr int kIssuers = 4;

  std::string notes(int n) const { return path("notes-" + std::to_string(n)); }
  [[noreturn]] static void issue(const std::string& file) {
    const int noted = open(file.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
    for (int i = 0; i < 2000; ++i) {
      OAUTHDBToken tokens("oauth_token");
      Json::Value issued;
      if (tokens.Add("alice", times(64, 'c'), "read", "code", "xyz", "", issued) == 0) _exit(1);
      const std::string line = issued["access_token"].asString() + "\n";
      if (write(noted, line.data(), line.size()) < 0) _exit(1);
    }
    _exit(0);
  }

  std::vector<pid_t> issuers_;
};

TEST_F(IssuingTest, BackupIsOneMoment) {
  for (const char* const name : {"1.db", "2.db", "3.db"}) {
    const Lines before = acknowledged();
    const Outcome outcome = run({"backup", path(name)});
    EXPECT_EQ(0, outcome.code) << outcome.err;
    EXPECT_THAT(queryIn(path(name), "PRAGMA integrity_check"), ElementsAre("ok"));
    expectAll(before, tokensIn(path(name)));
  }
  stop();
  const Lines copied = rowsIn(path("2.db"));
  EXPECT_EQ(0, run({"restore", path("2.db"), "--yes"}).code);
  EXPECT_EQ(copied, rowsIn(files_.database()));
}

// A token that is issued during a restore is in the kept file or in the new database.
TEST_F(IssuingTest, RestoreLosesNothing) {
  Lines found;
  for (int n = 0; n < 10; ++n) EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  stop();
  // A killed issuer may leave a journal that a reader cannot roll back.
  execute("BEGIN IMMEDIATE; ROLLBACK");
  for (const std::string& name : fileNames()) {
    if (name.rfind("oauth.db", 0) != 0 || name == "oauth.db-journal") continue;
    const Lines tokens = tokensIn(path(name));
    EXPECT_THAT(tokens, Each(SizeIs(64))) << name;
    found.insert(found.end(), tokens.begin(), tokens.end());
  }
  expectAll(acknowledged(), found);
}

// Ctrl-C after the file is written and before it is named. The parameter says what the machine
// lacks.
class InterruptedTest : public BackupTest, public testing::WithParamInterface<Lines> {
 protected:
  InterruptedTest() {
    addClient('c');
    environment_ = GetParam();
  }
};

TEST_P(InterruptedTest, LeavesNothing) {
  environment_.emplace_back("OAUTHCTL_INTERRUPT=1");
  const Outcome outcome = run({"backup", copy_});
  EXPECT_EQ(128 + SIGINT, outcome.code);
  EXPECT_EQ("", outcome.out);
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
}

// Shows that the command above fails only because of the interruption.
TEST_P(InterruptedTest, SucceedsWithoutInterruption) {
  EXPECT_EQ(0, run({"backup", copy_}).code);
  EXPECT_EQ(rowsIn(files_.database()), rowsIn(copy_));
  EXPECT_EQ(0600U, modeOf(copy_));
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "oauth.db"));
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  EXPECT_THAT(fileNames(),
              ElementsAre("copy.db", "oauth.db", "oauth.db.before-restore-20231114-221320"));
}

TEST_P(InterruptedTest, LeavesARuinedDatabaseInItsPlace) {
  ASSERT_EQ(0, run({"backup", copy_}).code);
  std::ofstream(files_.database(), std::ios::binary) << times(9000, 'x');
  environment_.emplace_back("OAUTHCTL_INTERRUPT=1");
  EXPECT_EQ(128 + SIGINT, run({"restore", copy_, "--yes"}).code);
  EXPECT_EQ(times(9000, 'x'), databaseBytes());
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "oauth.db"));
}

// Shows that the command above fails only because of the interruption.
TEST_P(InterruptedTest, ReplacesARuinedDatabaseWithoutInterruption) {
  ASSERT_EQ(0, run({"backup", copy_}).code);
  std::ofstream(files_.database(), std::ios::binary) << times(9000, 'x');
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  EXPECT_EQ(rowsIn(copy_), rowsIn(files_.database()));
  EXPECT_EQ(0600U, modeOf(files_.database()));
  EXPECT_EQ(times(9000, 'x'), bytesOf(path("oauth.db.before-restore-20231114-221320")));
  EXPECT_THAT(fileNames(),
              ElementsAre("copy.db", "oauth.db", "oauth.db.before-restore-20231114-221320"));
}

INSTANTIATE_TEST_SUITE_P(Machines, InterruptedTest,
                         testing::Values(Lines{}, Lines{"OAUTHCTL_NO_TMPFILE=1"},
                                         Lines{"OAUTHCTL_NO_TMPFILE=1", "OAUTHCTL_NO_PROC=1"}));

// Ctrl-C while it waits for the database.
TEST_F(BackupTest, LeavesNothingIfInterruptedWhileItWaits) {
  addClient('c');
  sqlite3* db = nullptr;
  sqlite3_open_v2(files_.database().c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
  sqlite3_exec(db, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr);
  beforeTyping_ = [] { usleep(300'000); };
  const Outcome outcome = runOnTerminal({"backup", copy_}, "\x03");
  sqlite3_close_v2(db);
  EXPECT_EQ(128 + SIGINT, outcome.code);
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
}

class RestoreTest : public BackupTest {
 protected:
  RestoreTest() {
    addClient('c');
    addToken('a');
    EXPECT_EQ(0, run({"backup", copy_}).code);
    saved_ = rowsIn(copy_);
    addToken('b');
    addCode('k');
  }
  // Expects that the file is refused for this reason, and nothing is changed.
  void expectRefused(const std::string& reason) const {
    const std::string before = databaseBytes();
    const Outcome outcome = run({"restore", copy_, "--yes"});
    EXPECT_EQ("", outcome.out);
    EXPECT_EQ(1, outcome.code);
    EXPECT_THAT(outcome.err,
                StartsWith("oauthctl: " + copy_ + " is refused, nothing changed: " + reason));
    EXPECT_EQ(before, databaseBytes());
    EXPECT_THAT(fileNames(), ElementsAre("copy.db", "oauth.db"));
  }

  Lines saved_;
  const std::string kept_ = path("oauth.db.before-restore-20231114-221320");
};

TEST_F(RestoreTest, ReplacesEveryRow) {
  const Lines before = rowsIn(files_.database());
  const Outcome outcome = run({"restore", copy_, "--yes"});
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_EQ(
      "restored 1 client, 0 codes, 1 token, 1 log line\nwhat was there is kept in " + kept_ + "\n",
      outcome.out);
  EXPECT_EQ(saved_, rowsIn(files_.database()));
  EXPECT_EQ(before, rowsIn(kept_));
  EXPECT_EQ(0600U, modeOf(kept_));
  EXPECT_EQ("alice", json({"token", "list"})[0U]["username"].asString());
}

TEST_F(RestoreTest, CanBeUndone) {
  const Lines before = rowsIn(files_.database());
  run({"restore", copy_, "--yes"});
  EXPECT_EQ("restored 1 client, 1 code, 2 tokens, 1 log line\nwhat was there is kept in " + kept_ +
                "-2\n",
            run({"restore", kept_, "--yes"}).out);
  EXPECT_EQ(before, rowsIn(files_.database()));
  EXPECT_EQ(saved_, rowsIn(kept_ + "-2"));
}

TEST_F(RestoreTest, LeavesOutTokensOnRequest) {
  EXPECT_EQ(0, run({"restore", copy_, "--without-tokens", "--yes"}).code);
  EXPECT_EQ(1, rowCount("oauth_clientInfo"));
  EXPECT_EQ(0, rowCount("oauth_token"));
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
}

TEST_F(RestoreTest, ReplacesNothingWithoutConfirmation) {
  const std::string before = databaseBytes();
  EXPECT_EQ(2, run({"restore", copy_}).code);
  EXPECT_EQ(before, databaseBytes());
}

// The journal mode of the backup must not change that of the server's database.
TEST_F(RestoreTest, KeepsTheJournalMode) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(copy_.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
  sqlite3_exec(db, "PRAGMA journal_mode = wal", nullptr, nullptr, nullptr);
  sqlite3_close_v2(db);
  ASSERT_THAT(queryIn(copy_, "PRAGMA journal_mode"), ElementsAre("wal"));
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  EXPECT_THAT(queryIn(files_.database(), "PRAGMA journal_mode"), ElementsAre("delete"));
}

TEST_F(RestoreTest, RefusesADamagedFile) {
  std::fstream file(copy_, std::ios::in | std::ios::out | std::ios::binary);
  for (std::size_t at = 4096; at < bytesOf(copy_).size(); at += 4096) {
    file.seekp(static_cast<std::streamoff>(at) + 8);
    file << times(64, '\x7f');
  }
  file.close();
  expectRefused("");
}

TEST_F(RestoreTest, RefusesATruncatedFile) {
  ASSERT_EQ(0, truncate(copy_.c_str(), 5000));
  expectRefused("");
}

TEST_F(RestoreTest, RefusesAForeignFile) {
  std::ofstream(copy_, std::ios::binary) << times(9000, 'x');
  expectRefused("file is not a database");
}

TEST_F(RestoreTest, RefusesAnEmptyFile) {
  ASSERT_EQ(0, truncate(copy_.c_str(), 0));
  expectRefused("table oauth_clientInfo is missing (and 4 more)");
}

TEST_F(RestoreTest, RefusesADatabaseWithAnotherTable) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(copy_.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
  sqlite3_exec(db, "CREATE TABLE extra(a)", nullptr, nullptr, nullptr);
  sqlite3_close_v2(db);
  expectRefused("unknown table extra");
}

TEST_F(RestoreTest, RefusesABackupOfAnotherMachine) {
  sqlite3* db = nullptr;
  sqlite3_open_v2(copy_.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
  sqlite3_exec(db,
               "UPDATE oauth_clientInfo SET client_id = 'x', client_secret = 'y';"
               "UPDATE oauth_token SET client_id = 'x'",
               nullptr, nullptr, nullptr);
  sqlite3_close_v2(db);
  expectRefused("it was encrypted on another machine, or this one has lost its key");
}

TEST_F(RestoreTest, RefusesAPathThatIsNoBackup) {
  EXPECT_EQ("1 cannot read /nonexistent: No such file or directory",
            complaint(run({"restore", "/nonexistent", "--yes"})));
  EXPECT_EQ("1 " + files_.directory() + " is refused, nothing changed: it is not a file",
            complaint(run({"restore", files_.directory(), "--yes"})));
  EXPECT_EQ("2 " + files_.database() + " is the database itself",
            complaint(run({"restore", files_.database(), "--yes"})));
}

TEST_F(RestoreTest, RefusesAPipe) {
  std::filesystem::remove(copy_);
  ASSERT_EQ(0, mkfifo(copy_.c_str(), 0600));
  expectRefused("it is not a file");
}

TEST_F(RestoreTest, RefusesALink) {
  std::filesystem::rename(copy_, path("real.db"));
  ASSERT_EQ(0, symlink("real.db", copy_.c_str()));
  EXPECT_EQ("1 " + copy_ + " is refused, nothing changed: it is a link, name the file itself",
            complaint(run({"restore", copy_, "--yes"})));
}

// Its size is checked before memory is allocated.
TEST_F(RestoreTest, RefusesAFileThatIsTooLarge) {
  ASSERT_EQ(0, truncate(copy_.c_str(), 512L * 1024 * 1024 + 1));
  expectRefused("it is too large for a backup");
}

// A database and its journal belong together: SQLite would apply the journal.
TEST_F(RestoreTest, RefusesAFileWithAJournal) {
  for (const std::string& journal : {copy_ + "-journal", copy_ + "-wal"}) {
    std::ofstream(journal, std::ios::binary) << "\xd9\xd5\x05\xf9";
    const std::string before = databaseBytes();
    EXPECT_EQ("1 " + copy_ +
                  " is refused, nothing changed: it is half of a database, the other "
                  "half is " +
                  journal,
              complaint(run({"restore", copy_, "--yes"})));
    EXPECT_EQ(before, databaseBytes());
    ASSERT_EQ(0, truncate(journal.c_str(), 0));
  }
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
}

TEST_F(RestoreTest, MakesAMissingDatabase) {
  std::filesystem::remove(files_.database());
  EXPECT_EQ("restored 1 client, 0 codes, 1 token, 1 log line\n",
            run({"restore", copy_, "--yes"}).out);
  EXPECT_EQ(saved_, rowsIn(files_.database()));
  EXPECT_EQ(0600U, modeOf(files_.database()));
}

TEST_F(RestoreTest, FillsAnEmptyFile) {
  ASSERT_EQ(0, truncate(files_.database().c_str(), 0));
  EXPECT_EQ("restored 1 client, 0 codes, 1 token, 1 log line\n",
            run({"restore", copy_, "--yes"}).out);
  EXPECT_EQ(saved_, rowsIn(files_.database()));
}

// SQLite cannot write into such a file, so it is moved away together with its journal.
TEST_F(RestoreTest, ReplacesAFileThatIsNoDatabase) {
  std::ofstream(files_.database(), std::ios::binary) << times(9000, 'x');
  std::ofstream(files_.database() + "-journal", std::ios::binary) << "\xd9\xd5\x05\xf9 old";
  EXPECT_EQ(
      "restored 1 client, 0 codes, 1 token, 1 log line\nwhat was there is kept in " + kept_ + "\n",
      run({"restore", copy_, "--yes"}).out);
  EXPECT_EQ(saved_, rowsIn(files_.database()));
  EXPECT_EQ(times(9000, 'x'), bytesOf(kept_));
}

TEST_F(RestoreTest, LeavesARuinedFileIfTheDiskIsFull) {
  std::ofstream(files_.database(), std::ios::binary) << times(9000, 'x');
  environment_ = {"OAUTHCTL_FULL_DISK=1"};
  EXPECT_EQ("1 cannot write " + files_.database() + ": No space left on device",
            complaint(run({"restore", copy_, "--yes"})));
  EXPECT_EQ(times(9000, 'x'), databaseBytes());
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "oauth.db"));
}

TEST_F(RestoreTest, ReplacesADamagedDatabase) {
  std::fstream file(files_.database(), std::ios::in | std::ios::out | std::ios::binary);
  for (std::size_t at = 4096; at < databaseBytes().size(); at += 4096) {
    file.seekp(static_cast<std::streamoff>(at) + 8);
    file << times(64, '\x7f');
  }
  file.close();
  const std::string damaged = databaseBytes();
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  EXPECT_EQ(saved_, rowsIn(files_.database()));
  EXPECT_EQ(damaged, bytesOf(kept_));
}

TEST_F(RestoreTest, KeepsTheMode) {
  chmod(files_.database().c_str(), 0640);
  EXPECT_EQ(0, run({"restore", copy_, "--yes"}).code);
  EXPECT_EQ(0640U, modeOf(files_.database()));
}

// A program that reads meanwhile sees all old rows or all new ones.
TEST_F(RestoreTest, IsOneStepForOtherProcesses) {
  ASSERT_EQ(0, run({"backup", path("more.db")}).code);
  files_.waitForLocks();
  const pid_t reader = fork();
  if (reader == 0) {
    sqlite3* db = nullptr;
    sqlite3_open_v2(files_.database().c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    sqlite3_busy_timeout(db, 20000);
    int mixed = 0;
    const auto countMixed = [](void* context, int, char** values, char**) {
      const std::string seen = values[0];
      *static_cast<int*>(context) += seen != "1 token, 0 codes" && seen != "2 token, 1 codes";
      return 0;
    };
    for (int i = 0; i < 500; ++i)
      if (sqlite3_exec(db,
                       "SELECT (SELECT COUNT(*) FROM oauth_token) || ' token, ' || "
                       "(SELECT COUNT(*) FROM oauth_grantCode) || ' codes'",
                       countMixed, &mixed, nullptr) != SQLITE_OK)
        ++mixed;
    _exit(mixed == 0 ? 0 : 1);
  }
  for (const char* const name : {"copy.db", "more.db", "copy.db", "more.db"}) {
    const Outcome outcome = run({"restore", path(name), "--yes"});
    EXPECT_EQ(0, outcome.code) << outcome.err;
  }
  int status = -1;
  waitpid(reader, &status, 0);
  EXPECT_EQ(0, status);
}

}  // namespace
