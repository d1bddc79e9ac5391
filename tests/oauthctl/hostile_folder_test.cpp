// Root runs the program in a folder of another user, who has put files there that could make root
// do damage.

#include <fcntl.h>
#include <linux/capability.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <thread>

#include "oauthctl_test.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

namespace fs = std::filesystem;

namespace {

constexpr unsigned kNobody = 65534;

const std::vector<Words> kEveryCommand = {
    {"status"},
    {"check"},
    {"client", "list"},
    {"client", "show", "1"},
    {"client", "edit", "1", "--name", "x"},
    {"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r"},
    {"code", "purge", "--yes"},
    {"token", "list"},
    {"token", "purge", "--grace", "0", "--yes"},
    {"log"},
    {"log", "clear", "--yes"},
};

std::string bigEndian(std::uint32_t number) {
  std::string bytes;
  for (const unsigned shift : {24U, 16U, 8U, 0U}) bytes += static_cast<char>(number >> shift);
  return bytes;
}

class HostileFolderTest : public OauthctlTest {
 protected:
  void SetUp() override {
    if (getuid() != 0) GTEST_SKIP() << "only root has rights to lose";
    // Hard links need the same file system.
    std::string name = fs::path(files_.directory()).parent_path() / "zevooauth-test-XXXXXX";
    ASSERT_NE(nullptr, mkdtemp(name.data()));
    rootsFolder_ = name;
    makeVictim();
  }
  ~HostileFolderTest() override {
    if (!rootsFolder_.empty()) fs::remove_all(rootsFolder_);
  }

  // Makes a database like the one that the owner's server leaves.
  void fillDatabase() const {
    addClient('c');
    addToken('a', "alice", kNow - 100 * kDay);
    chmod(files_.database().c_str(), 0600);
    giveToNobody();
  }

  void makeVictim() const {
    std::ofstream(victim()) << kPrecious;
    ASSERT_EQ(0, chmod(victim().c_str(), 0600));
  }

  // A file of root in a folder of root.
  std::string victim() const { return rootsFolder_ + "/victim"; }
  void expectVictimUntouched() const {
    struct stat status = {};
    ASSERT_EQ(0, lstat(victim().c_str(), &status)) << "the file of root is gone";
    EXPECT_EQ(0U, status.st_uid);
    EXPECT_EQ(0600U, status.st_mode & 07777U);
    EXPECT_EQ(kPrecious, bytesOf(victim()));
  }
  // Expects that no file in the owner's folder has the contents of root's file.
  void expectNothingGivenAway() const {
    expectVictimUntouched();
    for (const auto& entry : fs::directory_iterator(files_.directory())) {
      if (!entry.is_symlink() && entry.is_regular_file()) {
        EXPECT_THAT(bytesOf(entry.path()), Not(HasSubstr(kPrecious))) << entry.path();
      }
    }
  }
  void plantLink(const std::string& target, const std::string& name) const {
    ASSERT_EQ(0, symlink(target.c_str(), path(name).c_str()));
    ASSERT_EQ(0, lchown(path(name).c_str(), kNobody, kNobody));
  }
  Lines fileNames() const {
    Lines names;
    for (const auto& entry : fs::directory_iterator(files_.directory()))
      names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    return names;
  }
  // "<user>:<group> <mode>"
  static std::string ownerOf(const std::string& file) {
    struct stat status = {};
    EXPECT_EQ(0, lstat(file.c_str(), &status)) << file;
    char text[64];
    std::snprintf(text, sizeof text, "%u:%u %04o", status.st_uid, status.st_gid,
                  status.st_mode & 07777U);
    return text;
  }

  const std::string kPrecious = "precious " + times(100, 'p');
  std::string rootsFolder_;
};

// The journal of a transaction over several databases names a file that SQLite deletes after it has
// rolled back the transaction. This journal rolls back nothing.
class HostileJournalTest : public HostileFolderTest {
 protected:
  void plantJournal() const {
    constexpr char kMagic[] = "\xd9\xd5\x05\xf9\x20\xa1\x63\xd7";
    constexpr std::uint32_t kSector = 512, kPage = 4096, kLockingPage = 0x40000000 / kPage + 1;
    const auto pages = static_cast<std::uint32_t>(databaseBytes().size() / kPage);
    std::string journal = kMagic + bigEndian(0) + bigEndian(0) + bigEndian(pages) +
                          bigEndian(kSector) + bigEndian(kPage);
    journal.resize(kSector, '\0');
    std::uint32_t sum = 0;
    for (const char c : victim()) sum += static_cast<unsigned char>(c);
    journal += bigEndian(kLockingPage) + victim() +
               bigEndian(static_cast<std::uint32_t>(victim().size())) + bigEndian(sum) + kMagic;
    const std::string file = files_.database() + "-journal";
    std::ofstream(file, std::ios::binary) << journal;
    ASSERT_EQ(0, chown(file.c_str(), kNobody, kNobody));
  }
};

TEST_F(HostileJournalTest, DeletesNoFileOfRoot) {
  fillDatabase();
  std::vector<Words> commands = kEveryCommand;
  commands.push_back({"backup", rootsFolder_ + "/copy.db"});
  for (const Words& words : commands) {
    SCOPED_TRACE(words[0] + " " + words.back());
    makeVictim();
    plantJournal();
    run(words);
    expectVictimUntouched();
  }
}

TEST_F(HostileJournalTest, DeletesNoFileOfRootInARestore) {
  fillDatabase();
  const std::string copy = rootsFolder_ + "/copy.db";
  ASSERT_EQ(0, run({"backup", copy}).code);
  plantJournal();
  run({"restore", copy, "--yes"});
  expectVictimUntouched();
}

// Shows that SQLite accepts the journal above: it deletes a file of the owner.
TEST_F(HostileJournalTest, DeletesAFileOfItsOwner) {
  fillDatabase();
  ASSERT_EQ(0, chown(rootsFolder_.c_str(), kNobody, kNobody));
  ASSERT_EQ(0, chown(victim().c_str(), kNobody, kNobody));
  plantJournal();
  EXPECT_EQ(0, run({"status"}).code);
  EXPECT_FALSE(fs::exists(victim()));
}

TEST_F(HostileFolderTest, LinkInPlaceOfTheDatabaseIsRefused) {
  plantLink(victim(), "oauth.db");
  giveToNobody();
  for (const Words& words : kEveryCommand) {
    SCOPED_TRACE(words[0] + " " + words.back());
    EXPECT_EQ("3 " + files_.database() + " is a link: put the database itself there",
              complaint(run(words)));
    expectNothingGivenAway();
  }
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
}

TEST_F(HostileFolderTest, LinkInPlaceOfTheDatabaseIsNeitherCopiedNorReplaced) {
  fillDatabase();
  const std::string copy = rootsFolder_ + "/copy.db", line = "3 " + files_.database() +
                                                             " is a link: put the database "
                                                             "itself there";
  ASSERT_EQ(0, run({"backup", copy}).code);
  fs::remove(files_.database());
  plantLink(victim(), "oauth.db");
  EXPECT_EQ(line, complaint(run({"restore", copy, "--yes"})));
  EXPECT_EQ(line, complaint(run({"backup", rootsFolder_ + "/copy2.db"})));
  expectNothingGivenAway();
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db"));
  EXPECT_FALSE(fs::exists(rootsFolder_ + "/copy2.db"));
}

TEST_F(HostileFolderTest, LinkToAMissingFileMakesNoFile) {
  plantLink(rootsFolder_ + "/made", "oauth.db");
  giveToNobody();
  for (const Words& words : kEveryCommand) EXPECT_EQ(3, run(words).code);
  EXPECT_FALSE(fs::exists(rootsFolder_ + "/made"));
}

TEST_F(HostileFolderTest, PipeInPlaceOfTheDatabaseDoesNotHang) {
  ASSERT_EQ(0, mkfifo(files_.database().c_str(), 0600));
  giveToNobody();
  for (const Words& words : kEveryCommand)
    EXPECT_EQ("3 " + files_.database() + " is not a regular file", complaint(run(words)));
}

TEST_F(HostileFolderTest, RestoredFilesBelongToTheOwner) {
  fillDatabase();
  const std::string copy = rootsFolder_ + "/copy.db";
  ASSERT_EQ(0, run({"backup", copy}).code);
  EXPECT_EQ(0, run({"restore", copy, "--yes"}).code);
  for (const std::string& name : fileNames())
    EXPECT_EQ("65534:65534 0600", ownerOf(path(name))) << name;
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db", StartsWith("oauth.db.before-restore-")));
  fs::remove(files_.database());
  EXPECT_EQ(0, run({"restore", copy, "--yes"}).code);
  EXPECT_EQ("65534:65534 0600", ownerOf(files_.database()));
  std::ofstream(files_.database(), std::ios::binary) << times(9000, 'x');
  EXPECT_EQ(0, run({"restore", copy, "--yes"}).code);
  for (const std::string& name : fileNames())
    EXPECT_EQ("65534:65534 0600", ownerOf(path(name))) << name;
}

// A user without a name gets the group of the folder.
TEST_F(HostileFolderTest, RestoredFilesBelongToAnOwnerWithoutAName) {
  fillDatabase();
  for (const std::string& file : {files_.directory(), files_.database()})
    if (chown(file.c_str(), 123456, 123457) != 0) GTEST_SKIP() << "there is no such user here";
  const std::string copy = rootsFolder_ + "/copy.db";
  ASSERT_EQ(0, run({"backup", copy}).code);
  EXPECT_EQ(0, run({"restore", copy, "--yes"}).code);
  for (const std::string& name : fileNames())
    EXPECT_EQ("123456:123457 0600", ownerOf(path(name))) << name;
}

// A backup belongs to the operator, in whatever folder it is.
TEST_F(HostileFolderTest, BackupBelongsToTheOperator) {
  fillDatabase();
  for (const bool named : {false, true}) {
    if (named) environment_ = {"OAUTHCTL_NO_TMPFILE=1"};
    const std::string copy = path(named ? "named.db" : "copy.db");
    const Outcome outcome = run({"backup", copy});
    EXPECT_EQ(0, outcome.code) << outcome.err;
    EXPECT_EQ("0:0 0600", ownerOf(copy));
    EXPECT_EQ(rowsIn(files_.database()), rowsIn(copy));
  }
}

TEST_F(HostileFolderTest, LinkWithTheBackupsNameIsNotFollowed) {
  fillDatabase();
  plantLink(victim(), "copy.db");
  plantLink(rootsFolder_ + "/made", "copy2.db");
  for (const std::string name : {"copy.db", "copy2.db"})
    EXPECT_EQ("2 " + path(name) + " exists, and no file is ever replaced",
              complaint(run({"backup", path(name)})));
  expectNothingGivenAway();
  EXPECT_FALSE(fs::exists(rootsFolder_ + "/made"));
  EXPECT_THAT(fileNames(), ElementsAre("copy.db", "copy2.db", "oauth.db"));
}

TEST_F(HostileFolderTest, LinkInPlaceOfABackupIsNotRead) {
  fillDatabase();
  plantLink(victim(), "copy.db");
  EXPECT_EQ(
      "1 " + path("copy.db") + " is refused, nothing changed: it is a link, name the file itself",
      complaint(run({"restore", path("copy.db"), "--yes"})));
  expectNothingGivenAway();
}

// The owner waits for a temporary file, moves it away, and puts a link in its place.
class SwappedNameTest : public HostileFolderTest {
 protected:
  void SetUp() override {
    HostileFolderTest::SetUp();
    if (IsSkipped()) return;
    fillDatabase();
    ASSERT_EQ(0, chmod(rootsFolder_.c_str(),
                       0711));  // the program, with the owner's ids, must see the file "go"
    environment_ = {"OAUTHCTL_NO_TMPFILE=1", "OAUTHCTL_HOLD=" + rootsFolder_ + "/go"};
  }
  // Runs the command while its temporary file, whose name begins like this, is swapped.
  Outcome runWhileSwapping(const Words& words, const std::string& prefix) {
    std::thread owner([this, prefix] {
      swap(prefix);
      std::ofstream(rootsFolder_ + "/go") << "";
    });
    Outcome outcome = run(words);
    owner.join();
    EXPECT_NE("", swapped_) << "there was nothing to swap";
    return outcome;
  }
  void swap(const std::string& prefix) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (swapped_.empty() && std::chrono::steady_clock::now() < end)
      for (const std::string& name : fileNames())
        if (name.rfind(prefix, 0) == 0) swapped_ = name;
    if (swapped_.empty()) return;
    fs::rename(path(swapped_), path("taken"));
    plantLink(victim(), swapped_);
  }

  std::string swapped_;
};

TEST_F(SwappedNameTest, PutsNothingIntoABackup) {
  const Outcome outcome = runWhileSwapping({"backup", path("copy.db")}, "copy.db.");
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_EQ("0:0 0600", ownerOf(path("copy.db")));
  EXPECT_EQ(rowsIn(files_.database()), rowsIn(path("copy.db")));
  expectNothingGivenAway();
}

// If the program must rename the temporary file, it checks afterwards which file has the name.
TEST_F(SwappedNameTest, IsDetectedWithoutProc) {
  environment_.emplace_back("OAUTHCTL_NO_PROC=1");
  EXPECT_EQ("1 somebody put another file in the place of " + path("copy.db"),
            complaint(runWhileSwapping({"backup", path("copy.db")}, "copy.db.")));
  expectNothingGivenAway();
}

TEST_F(SwappedNameTest, PutsNothingIntoTheKeptFile) {
  const std::string copy = rootsFolder_ + "/copy.db";
  std::ofstream(rootsFolder_ + "/go") << "";
  ASSERT_EQ(0, run({"backup", copy}).code);
  fs::remove(rootsFolder_ + "/go");
  const Lines before = rowsIn(files_.database());
  constexpr char kKept[] = "oauth.db.before-restore-20231114-221320";
  const Outcome outcome = runWhileSwapping({"restore", copy, "--yes"}, kKept + std::string("."));
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_EQ("65534:65534 0600", ownerOf(path(kKept)));
  EXPECT_EQ(before, rowsIn(path(kKept)));
  expectNothingGivenAway();
}

// The owner puts a link to a database of root in the place of the database and removes it again,
// all the time.
class SwappedDatabaseTest : public HostileFolderTest {
 protected:
  void SetUp() override {
    HostileFolderTest::SetUp();
    if (IsSkipped()) return;
    fillDatabase();
    fs::copy(files_.database(), secret());
    ASSERT_EQ(0, chmod(secret().c_str(), 0600));
    ASSERT_EQ(SQLITE_OK, sqlite3_open(secret().c_str(), &db_));
    const std::string sql = "UPDATE oauth_token SET username = '" + kPrecious + "'";
    ASSERT_EQ(SQLITE_OK, sqlite3_exec(db_, sql.c_str(), nullptr, nullptr, nullptr));
    sqlite3_close(db_);
  }
  std::string secret() const { return rootsFolder_ + "/secret.db"; }
  void swap() const {
    const std::string database = files_.database(), real = path("real.db");
    rename(database.c_str(), real.c_str());
    symlink(secret().c_str(), database.c_str());
    unlink(database.c_str());
    rename(real.c_str(), database.c_str());
  }

  sqlite3* db_ = nullptr;
};

TEST_F(SwappedDatabaseTest, NeverGivesAwayADatabaseOfRoot) {
  const std::string before = bytesOf(secret()), copy = rootsFolder_ + "/copy.db";
  ASSERT_EQ(0, run({"backup", copy}).code);
  std::atomic<bool> done{false};
  std::thread owner([&] {
    while (!done) swap();
  });
  for (int round = 0; round < 10; ++round)
    for (const Words& words :
         {Words{"restore", copy, "--yes"},
          {"status"},
          {"check"},
          {"token", "purge", "--grace", "0", "--yes"},
          {"backup", rootsFolder_ + "/copy-" + std::to_string(round)},
          {"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r"}})
      EXPECT_GT(4, run(words).code);
  done = true;
  owner.join();
  EXPECT_EQ(before, bytesOf(secret()));
  EXPECT_EQ("0:0 0600", ownerOf(secret()));
  expectNothingGivenAway();
}

// The ids that the kernel shows for the program while it makes a backup.
class IdsTest : public HostileFolderTest {
 protected:
  IdsTest() : copy_("/copy.db") {}
  void SetUp() override {
    HostileFolderTest::SetUp();
    if (IsSkipped()) return;
    fillDatabase();
    copy_ = rootsFolder_ + copy_;
  }
  // The number of the process that makes our backup, "" if there is none yet.
  std::string program() const {
    for (const auto& entry : fs::directory_iterator("/proc")) {
      const std::string arguments = bytesOf(entry.path() / "cmdline");
      if (arguments.find(std::string("backup\0", 7) + copy_) != std::string::npos)
        return entry.path().filename();
    }
    return "";
  }
  static std::string statusLine(const std::string& process, const std::string& name) {
    std::ifstream status("/proc/" + process + "/status");
    for (std::string line; std::getline(status, line);)
      if (line.rfind(name, 0) == 0) return line;
    return "";
  }
  // Runs the backup, and calls the body when the program is about to name the file.
  Outcome runBackup(const std::function<void(const std::string& process)>& body) {
    environment_ = {"OAUTHCTL_HOLD=" + rootsFolder_ + "/go"};
    std::thread observer([&] {
      std::string process;
      const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
      while (statusLine(process, "Uid:").find("65534") == std::string::npos &&
             std::chrono::steady_clock::now() < end)
        process = program();
      body(process);
      std::ofstream(rootsFolder_ + "/go") << "";
    });
    Outcome outcome = run({"backup", copy_});
    observer.join();
    return outcome;
  }

  std::string copy_;
};

TEST_F(IdsTest, BelongToTheOwnerWhoCannotSignalTheProgram) {
  std::string users, groups, more;
  int signalled = -1;
  const Outcome outcome = runBackup([&](const std::string& process) {
    users = statusLine(process, "Uid:");
    groups = statusLine(process, "Gid:");
    more = statusLine(process, "Groups:");
    const pid_t owner = fork();
    if (owner == 0) {
      if (setgid(kNobody) != 0 || syscall(SYS_setuid, kNobody) != 0) _exit(9);
      const bool refused = kill(std::stoi(process), SIGTERM) != 0 && errno == EPERM;
      const bool hidden = access(("/proc/" + process + "/fd/0").c_str(), F_OK) != 0;
      _exit(refused && hidden ? 0 : 1);
    }
    waitpid(owner, &signalled, 0);
  });
  EXPECT_EQ("Uid:\t0\t65534\t0\t65534", users);
  EXPECT_EQ("Gid:\t0\t65534\t0\t65534", groups);
  EXPECT_THAT(more, testing::MatchesRegex("Groups:\t65534 *"));
  EXPECT_EQ(0, signalled);
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_EQ("0:0 0600", ownerOf(copy_));
}

// If root has no right to change its ids, the command ends.
TEST_F(IdsTest, AreTakenBeforeAnythingHappens) {
  for (const int right : {CAP_SETUID, CAP_SETGID}) {
    beforeExec_ = [right] {
      if (prctl(PR_CAPBSET_DROP, right, 0, 0, 0) != 0) _exit(97);
    };
    for (const Words& words : kEveryCommand)
      EXPECT_EQ("3 cannot take the ids of user 65534: Operation not permitted",
                complaint(run(words)));
    EXPECT_EQ("3 cannot take the ids of user 65534: Operation not permitted",
              complaint(run({"backup", copy_})));
  }
  EXPECT_FALSE(fs::exists(copy_));
}

// As if root had made the database.
TEST_F(HostileFolderTest, DatabaseOfRootIsRefused) {
  fillDatabase();
  ASSERT_EQ(0, chown(files_.database().c_str(), 0, 0));
  for (const Words& words : kEveryCommand)
    EXPECT_EQ("3 user 65534, whose ids root takes here, may not read " + files_.database() +
                  ": run 'chown -h 65534 " + files_.database() + "', it belongs to user 0",
              complaint(run(words)));
  chmod(files_.database().c_str(), 0644);
  EXPECT_EQ(0, run({"token", "list"}).code);
  EXPECT_EQ("3 user 65534, whose ids root takes here, may not write " + files_.database() +
                ": run 'chown -h 65534 " + files_.database() + "', it belongs to user 0",
            complaint(run({"token", "purge", "--yes"})));
}

// Whoever gives away the hard link gives away the file of root.
TEST_F(HostileFolderTest, NoAdviceGivesAwayAFileOfRoot) {
  std::error_code refused;
  fs::create_hard_link(victim(), files_.database(), refused);
  ASSERT_FALSE(refused) << refused.message();
  ASSERT_EQ(0, chown(files_.directory().c_str(), kNobody, kNobody));
  EXPECT_EQ("3 user 65534, whose ids root takes here, may not read " + files_.database() +
                ": it has other names too, find out who made it",
            complaint(run({"status"})));
  expectVictimUntouched();
}

// Everybody who may write to a folder of root can put the same files there.
TEST_F(HostileFolderTest, FolderOfRootThatOthersMayWriteIsRefused) {
  addClient('c');
  for (const mode_t mode : {0770, 0777, 0702}) {
    chmod(files_.directory().c_str(), mode);
    for (const Words& words : kEveryCommand) {
      if (words.front() == "check") continue;
      EXPECT_EQ("3 " + files_.directory() +
                    " belongs to root and others may write to it, which makes root do what they "
                    "want: chown it to the server's user, or chmod go-w",
                complaint(run(words)));
    }
  }
}

TEST_F(HostileFolderTest, FolderOfRootThatOthersMayWriteIsTheOnlyFinding) {
  const std::string contents = "no database";
  std::ofstream(files_.database()) << contents;
  chmod(files_.directory().c_str(), 0777);
  const Outcome outcome = run({"check"});
  EXPECT_EQ(1, outcome.code);
  EXPECT_EQ("oauthctl: 1 finding\n", outcome.err);
  EXPECT_EQ(
      files_.directory() + " has mode 0777: others can replace the database. To do: chmod go-w.\n",
      outcome.out);
  EXPECT_EQ(contents, databaseBytes());
}

// The link appears after the library has checked the database and before SQLite opens it.
TEST_F(HostileFolderTest, LinkAtTheLastMomentMakesNoFileOfRoot) {
  for (const Words& words : kEveryCommand) {
    fillDatabase();
    plantLink(rootsFolder_ + "/made", "swap");
    environment_ = {"OAUTHCTL_SWAP=" + path("swap")};
    const int code = run(words).code;
    const bool usesTheLibrary = words.front() != "check";
    EXPECT_EQ(usesTheLibrary ? 3 : 0, code);
    environment_.clear();
    EXPECT_FALSE(fs::exists(rootsFolder_ + "/made"));
    fs::remove(files_.database());
    fs::remove(path("swap"));
  }
  expectVictimUntouched();
}

// The owner of a folder above can replace the last folder by a link to any folder of root.
TEST_F(HostileFolderTest, FolderAboveDecidesWhoseIdsRootTakes) {
  ASSERT_EQ(0, mkdir(path("target").c_str(), 0755));
  ASSERT_EQ(0, chmod(files_.directory().c_str(), 0755));
  ASSERT_EQ(0, symlink(rootsFolder_.c_str(), path("target/etc").c_str()));
  ASSERT_EQ(0, lchown(path("target").c_str(), kNobody, kNobody));
  environment_ = {"OAUTHCTL_FOLDER=" + path("target/etc")};
  for (const Words& words : kEveryCommand)
    EXPECT_EQ("3 user 65534, whose ids root takes here, may not look into " + path("target/etc") +
                  ": it belongs to user 0, find out who put it there",
              complaint(run(words)));
  for (const auto& entry : fs::directory_iterator(rootsFolder_))
    EXPECT_EQ(victim(), entry.path().string());
  expectVictimUntouched();
}

TEST_F(HostileFolderTest, FolderAboveThatOthersMayWriteIsRefused) {
  for (const char* const name : {"target", "target/etc"})
    ASSERT_EQ(0, mkdir(path(name).c_str(), 0755));
  ASSERT_EQ(0, chmod(path("target").c_str(), 0777));
  environment_ = {"OAUTHCTL_FOLDER=" + path("target/etc")};
  EXPECT_EQ("3 " + path("target") +
                " belongs to root and others may write to it, which makes root do what they want: "
                "chown it to the server's user, or chmod go-w",
            complaint(run({"status"})));
  EXPECT_EQ(
      path("target") + " has mode 0777: others can replace the database. To do: chmod go-w.\n",
      run({"check"}).out);
}

// SQLite would wait for ever when it opens a pipe, and would follow a link.
TEST_F(HostileFolderTest, JournalThatIsNoFileIsRefused) {
  fillDatabase();
  for (const std::string name : {"oauth.db-journal", "oauth.db-wal", "oauth.db-shm"}) {
    for (const bool isLink : {false, true}) {
      if (isLink)
        plantLink(victim(), name);
      else
        ASSERT_EQ(0, mkfifo(path(name).c_str(), 0666));
      for (const Words& words : kEveryCommand)
        EXPECT_EQ("3 " + path(name) + " is not a regular file: find out who made it, and remove it",
                  complaint(run(words)));
      fs::remove(path(name));
    }
  }
  expectNothingGivenAway();
}

// The first registration also makes the encryption key.
TEST_F(HostileFolderTest, FirstRegistrationMakesFilesOfTheOwner) {
  giveToNobody();
  useRealCipher();
  const Outcome outcome =
      run({"client", "add", "--name", "n", "--redirect-uri", "a.example", "--scope", "r"});
  EXPECT_EQ(0, outcome.code) << outcome.err;
  EXPECT_THAT(fileNames(), ElementsAre("oauth.db", "zevocore.key"));
  for (const std::string& name : fileNames())
    EXPECT_EQ("65534:65534 0600", ownerOf(path(name))) << name;
}

}  // namespace
