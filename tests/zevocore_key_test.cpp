#include "zevocore_key.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;
using zevocore::Key;
using zevocore::loadKey;

namespace fs = std::filesystem;

namespace {

class ZevocoreKeyTest : public testing::Test {
 protected:
  ZevocoreKeyTest() {
    std::string name = fs::temp_directory_path() / "zevooauth-test-XXXXXX";
    if (mkdtemp(name.data()) == nullptr) throw std::runtime_error("cannot make " + name);
    directory_ = name;
    keyFile_ = directory_ / "zevocore.key";
  }
  ~ZevocoreKeyTest() override {
    fs::permissions(directory_, fs::perms::owner_all);
    fs::remove_all(directory_);
  }

  std::optional<Key> load() const { return loadKey(directory_); }
  void writeKeyFile(const std::string& bytes) const {
    std::ofstream(keyFile_, std::ios::binary) << bytes;
  }
  std::string keyFileBytes() const {
    std::ifstream file(keyFile_, std::ios::binary);
    std::ostringstream bytes;
    bytes << file.rdbuf();
    return bytes.str();
  }
  // Whether the owner of the directory, who is not root, gets a key.
  bool anOrdinaryUserLoads() const {
    if (geteuid() != 0) return load().has_value();
    constexpr unsigned kNobody = 65534;
    for (const fs::path& path : {directory_, keyFile_})
      if (fs::exists(path) && chown(path.c_str(), kNobody, kNobody) != 0)
        throw std::runtime_error("cannot give away " + path.string());
    const pid_t child = fork();
    if (child == 0) {
      const bool dropped =
          setresgid(kNobody, kNobody, kNobody) == 0 && setresuid(kNobody, kNobody, kNobody) == 0;
      _exit(!dropped ? 2 : load() ? 1 : 0);
    }
    int status = -1;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) < 2) << status;
    return WEXITSTATUS(status) == 1;
  }
  std::vector<std::string> names() const {
    std::vector<std::string> result;
    for (const auto& entry : fs::directory_iterator(directory_))
      result.push_back(entry.path().filename());
    return result;
  }

  fs::path directory_, keyFile_;
};

std::string text(const Key& key) { return {key.begin(), key.end()}; }

TEST_F(ZevocoreKeyTest, MakesAKeyOnFirstUse) {
  const std::optional<Key> key = load();
  ASSERT_TRUE(key);
  EXPECT_EQ(text(*key), keyFileBytes());
  EXPECT_THAT(names(), ElementsAre("zevocore.key"));
}

TEST_F(ZevocoreKeyTest, KeepsTheKeyFromOthers) {
  const mode_t before = umask(0);
  load();
  umask(before);
  EXPECT_EQ(fs::perms::owner_read | fs::perms::owner_write, fs::status(keyFile_).permissions());
}

TEST_F(ZevocoreKeyTest, ReturnsTheSameKeyEveryTime) {
  const std::optional<Key> first = load();
  ASSERT_TRUE(first);
  EXPECT_EQ(first, load());
}

TEST_F(ZevocoreKeyTest, DrawsADifferentKeyForEveryDirectory) {
  const std::optional<Key> first = load();
  ASSERT_TRUE(first);
  fs::remove(keyFile_);
  const std::optional<Key> second = load();
  ASSERT_TRUE(second);
  EXPECT_NE(first, second);
}

TEST_F(ZevocoreKeyTest, GivesProcessesThatMakeItAtOnceOneKey) {
  constexpr int kProcesses = 16;
  int start[2], answers[2];
  ASSERT_EQ(0, pipe(start));
  ASSERT_EQ(0, pipe(answers));
  for (int i = 0; i < kProcesses; ++i) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      char go;
      close(start[1]);
      while (read(start[0], &go, 1) > 0) continue;  // until the parent closes its end
      const std::optional<Key> key = load();
      const bool ok = key && write(answers[1], key->data(), key->size()) == 64;
      _exit(ok ? 0 : 1);
    }
  }
  close(start[0]);
  close(start[1]);
  for (int i = 0; i < kProcesses; ++i) {
    int status = -1;
    wait(&status);
    EXPECT_EQ(0, status);
  }
  close(answers[1]);
  std::vector<std::string> keys;
  for (Key key; read(answers[0], key.data(), key.size()) == 64;) keys.push_back(text(key));
  close(answers[0]);
  EXPECT_EQ(kProcesses, static_cast<int>(keys.size()));
  EXPECT_THAT(keys, Each(keyFileBytes()));
  EXPECT_THAT(names(), ElementsAre("zevocore.key"));
}

TEST_F(ZevocoreKeyTest, NeverReplacesAFileOfTheWrongSize) {
  for (const std::size_t size : {0U, 1U, 63U, 65U, 4096U}) {
    const std::string bytes(size, 'k');
    writeKeyFile(bytes);
    EXPECT_EQ(std::nullopt, load()) << size;
    EXPECT_EQ(bytes, keyFileBytes()) << size;
  }
}

TEST_F(ZevocoreKeyTest, NeverReplacesADirectory) {
  fs::create_directory(keyFile_);
  EXPECT_EQ(std::nullopt, load());
  EXPECT_TRUE(fs::is_directory(keyFile_));
  EXPECT_THAT(names(), ElementsAre("zevocore.key"));
}

TEST_F(ZevocoreKeyTest, NeverFollowsASymbolicLink) {
  const fs::path target = directory_ / "elsewhere";
  std::ofstream(target) << std::string(64, 'k');
  fs::create_symlink(target, keyFile_);
  EXPECT_EQ(std::nullopt, load());
  EXPECT_TRUE(fs::is_symlink(keyFile_));
}

TEST_F(ZevocoreKeyTest, NeverFillsADanglingLink) {
  fs::create_symlink(directory_ / "nowhere", keyFile_);
  EXPECT_EQ(std::nullopt, load());
  EXPECT_THAT(names(), ElementsAre("zevocore.key"));
}

TEST_F(ZevocoreKeyTest, NeverWaitsForAPipe) {
  ASSERT_EQ(0, mkfifo(keyFile_.c_str(), 0600));
  EXPECT_EQ(std::nullopt, load());
  EXPECT_TRUE(fs::is_fifo(keyFile_));
}

TEST_F(ZevocoreKeyTest, MakesAKeyForAnOrdinaryUser) {
  EXPECT_TRUE(anOrdinaryUserLoads());
  EXPECT_THAT(names(), ElementsAre("zevocore.key"));
}

TEST_F(ZevocoreKeyTest, NeverReplacesAFileThatCannotBeRead) {
  writeKeyFile(std::string(64, 'k'));
  fs::permissions(keyFile_, fs::perms::none);
  EXPECT_FALSE(anOrdinaryUserLoads());
  fs::permissions(keyFile_, fs::perms::owner_read);
  EXPECT_EQ(std::string(64, 'k'), keyFileBytes());
}

TEST_F(ZevocoreKeyTest, MakesNothingWhereItMayNotWrite) {
  fs::permissions(directory_, fs::perms::owner_read | fs::perms::owner_exec);
  EXPECT_FALSE(anOrdinaryUserLoads());
  EXPECT_THAT(names(), IsEmpty());
}

TEST_F(ZevocoreKeyTest, MakesNothingInAMissingDirectory) {
  EXPECT_EQ(std::nullopt, loadKey(directory_ / "missing"));
  EXPECT_THAT(names(), IsEmpty());
}

}  // namespace
