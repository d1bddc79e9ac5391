// Databases that are missing, busy, or closed to the user.

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "oauthctl_test.h"

using testing::HasSubstr;
using testing::StartsWith;

namespace {

class DatabaseAccessTest : public OauthctlTest {};

const std::vector<Words> kEveryCommand = {
    {"status"},
    {"check"},
    {"client", "list"},
    {"client", "show", "1"},
    {"client", "edit", "1", "--name", "x"},
    {"client", "enable", "1"},
    {"client", "disable", "1"},
    {"client", "delete", "1", "--yes"},
    {"code", "list"},
    {"code", "revoke", "--id", "1", "--yes"},
    {"code", "purge", "--yes"},
    {"token", "list"},
    {"token", "show", "1"},
    {"token", "verify"},
    {"token", "revoke", "--id", "1", "--yes"},
    {"token", "purge", "--yes"},
    {"log"},
    {"log", "clear", "--yes"},
    {"backup", "/tmp/oauthctl-test-never-made.db"},
};

std::string listOf(const std::string& folder) {
  std::set<std::string> sorted;
  for (const auto& entry : std::filesystem::directory_iterator(folder))
    sorted.insert(entry.path().filename());
  std::string names;
  for (const std::string& name : sorted) names += name + " ";
  return names;
}

TEST_F(DatabaseAccessTest, MissingDatabaseIsNotMade) {
  for (const Words& words : kEveryCommand) {
    SCOPED_TRACE(words[0]);
    EXPECT_EQ("3 there is no database " + files_.database() +
                  ": 'oauthctl client add' or the server makes it",
              complaint(run(words)));
    EXPECT_EQ("", listOf(files_.directory()));
  }
}

TEST_F(DatabaseAccessTest, MissingFolderIsReported) {
  files_.removeDirectory();
  EXPECT_EQ(
      "3 there is no folder " + files_.directory() + " for the database: is the server installed?",
      complaint(run({"status"})));
  EXPECT_THAT(complaint(run(
                  {"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r"})),
              StartsWith("3 there is no folder "));
}

// The library leaves an empty file if it cannot write to a new database.
TEST_F(DatabaseAccessTest, EmptyDatabaseIsNotFilled) {
  close(creat(files_.database().c_str(), 0600));
  EXPECT_EQ("3 " + files_.database() + " is empty: 'oauthctl client add' or the server fills it",
            complaint(run({"status"})));
  EXPECT_EQ("", databaseBytes());
}

TEST_F(DatabaseAccessTest, DirectoryIsRefused) {
  mkdir(files_.database().c_str(), 0700);
  EXPECT_EQ("3 " + files_.database() + " is not a regular file", complaint(run({"status"})));
}

TEST_F(DatabaseAccessTest, LinkIsRefused) {
  addClient('c');
  rename(files_.database().c_str(), path("real.db").c_str());
  ASSERT_EQ(0, symlink("real.db", files_.database().c_str()));
  const std::string before = bytesOf(path("real.db"));
  for (const Words& words : kEveryCommand)
    EXPECT_EQ("3 " + files_.database() + " is a link: put the database itself there",
              complaint(run(words)));
  EXPECT_EQ(before, bytesOf(path("real.db")));
  EXPECT_EQ("oauth.db real.db ", listOf(files_.directory()));
}

TEST_F(DatabaseAccessTest, OtherFileIsNotOverwritten) {
  const std::string text = times(5000, 'x');
  std::FILE* const file = std::fopen(files_.database().c_str(), "w");
  std::fputs(text.c_str(), file);
  std::fclose(file);
  const Outcome outcome = run({"token", "purge", "--yes"});
  EXPECT_EQ(3, outcome.code);
  EXPECT_THAT(outcome.err, HasSubstr("is busy or cannot be used"));
  EXPECT_EQ(text, databaseBytes());
}

class LockedDatabaseTest : public DatabaseAccessTest {
 protected:
  void SetUp() override {
    addClient('c');
    addToken('a', "alice", kNow - 100 * kDay);
    ASSERT_EQ(SQLITE_OK,
              sqlite3_open_v2(files_.database().c_str(), &db_, SQLITE_OPEN_READWRITE, nullptr));
    before_ = databaseBytes();
  }
  ~LockedDatabaseTest() override { sqlite3_close_v2(db_); }
  void lock(const char* statement) {
    ASSERT_EQ(SQLITE_OK, sqlite3_exec(db_, statement, nullptr, nullptr, nullptr));
  }

  sqlite3* db_ = nullptr;
  std::string before_;
};

TEST_F(LockedDatabaseTest, StatusEndsWithThree) {
  lock("BEGIN EXCLUSIVE");
  EXPECT_THAT(complaint(run({"status"})), StartsWith("3 " + files_.database() + " is busy or "));
}

TEST_F(LockedDatabaseTest, CheckEndsWithThree) {
  lock("BEGIN EXCLUSIVE");
  EXPECT_EQ("3 the database is busy, try again", complaint(run({"check"})));
}

TEST_F(LockedDatabaseTest, BackupEndsWithThree) {
  lock("BEGIN EXCLUSIVE");
  EXPECT_EQ("3 the database is busy, no backup was made: try again",
            complaint(run({"backup", path("copy.db")})));
  EXPECT_EQ("oauth.db ", listOf(files_.directory()));
}

TEST_F(LockedDatabaseTest, PurgeEndsWithThree) {
  lock("BEGIN IMMEDIATE");
  EXPECT_EQ("3 the database is busy, nothing changed: cannot get the write lock, try again",
            complaint(run({"token", "purge", "--yes"})));
  EXPECT_EQ(before_, databaseBytes());
}

TEST_F(LockedDatabaseTest, RestoreEndsWithThree) {
  ASSERT_EQ(0, run({"backup", path("copy.db")}).code);
  lock("BEGIN IMMEDIATE");
  EXPECT_EQ("3 the database is busy, nothing changed: try again",
            complaint(run({"restore", path("copy.db"), "--yes"})));
  EXPECT_EQ(before_, databaseBytes());
  EXPECT_EQ(std::string::npos, listOf(files_.directory()).find("before"));
}

class OrdinaryUserTest : public DatabaseAccessTest {
 protected:
  void SetUp() override {
    if (getuid() != 0) GTEST_SKIP() << "only root can become somebody else";
    addClient('c');
    addToken('a');
    chmod(files_.directory().c_str(), 0755);
    chmod(files_.database().c_str(), 0600);
  }
};

TEST_F(OrdinaryUserTest, IsToldWhatMayNotBeRead) {
  for (const Words& words : {Words{"status"}, Words{"check"}, Words{"token", "list"},
                             Words{"backup", "/tmp/oauthctl-test-never-made.db"}})
    EXPECT_EQ("3 you may not read " + files_.database() +
                  ": run oauthctl as root or as the server's user",
              complaint(runAsNobody(words)));
}

TEST_F(OrdinaryUserTest, IsToldWhichFolderIsClosed) {
  chmod(files_.directory().c_str(), 0700);
  EXPECT_EQ("3 you may not look into " + files_.directory() +
                ": run oauthctl as root or as the server's user",
            complaint(runAsNobody({"status"})));
}

TEST_F(OrdinaryUserTest, IsToldWhatMayNotBeWritten) {
  chmod(files_.database().c_str(), 0644);
  EXPECT_EQ(0, runAsNobody({"token", "list"}).code);
  EXPECT_EQ("3 you may not write to " + files_.directory() +
                ": run oauthctl as root or as the server's user",
            complaint(runAsNobody({"token", "revoke", "--id", "1", "--yes"})));
  chmod(files_.directory().c_str(), 0777);
  EXPECT_EQ(
      "3 you may not write " + files_.database() + ": run oauthctl as root or as the server's user",
      complaint(runAsNobody({"token", "revoke", "--id", "1", "--yes"})));
  EXPECT_EQ(1, rowCount("oauth_token"));
}

TEST_F(OrdinaryUserTest, IsToldThatTheSettingsMayNotBeRead) {
  chmod(files_.database().c_str(), 0644);
  writeSettings("{\"token_max\": 7}");
  chmod(files_.settings().c_str(), 0600);
  EXPECT_THAT(runAsNobody({"status"}).out, HasSubstr("cannot be read (Permission denied)"));
}

}  // namespace
