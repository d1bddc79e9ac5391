// A process is killed in the middle of its work. Acknowledged changes stay, each other change is
// complete or absent, and the next process can use the file.
//
// ZEVOOAUTH_ROUNDS multiplies the random kills, for longer runs by hand.

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <iostream>
#include <random>
#include <thread>

#include "faulty_disk.h"
#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsSubsetOf;
using namespace ZEVOOAUTHSERVER;

namespace {

int issueExpired(char secret) {
  Json::Value result;
  return OAUTHDBToken("oauth_token")
      .Add("alice", times(64, 'c'), "read", times(64, secret), times(64, secret), "1", "code",
           "xyz", "", result);
}

class CrashTest : public StoreTest {
 protected:
  CrashTest() { files_.waitForLocks(); }

  // A process that runs the body, whose every acknowledgement is a line written to the pipe.
  struct Writer {
    pid_t process;
    int acknowledgements;
  };
  static Writer start(const std::function<void(int pipe)>& body) {
    int ends[2];
    if (pipe(ends) != 0) throw std::runtime_error("no pipe");
    const pid_t child = fork();
    if (child < 0) throw std::runtime_error("cannot fork");
    if (child == 0) {
      close(ends[0]);
      body(ends[1]);
      _exit(0);
    }
    close(ends[1]);
    return {child, ends[0]};
  }
  static void acknowledge(int pipe, const std::string& text) {
    const std::string line = text + "\n";
    if (write(pipe, line.data(), line.size()) != static_cast<ssize_t>(line.size())) _exit(1);
  }

  struct End {
    Lines acknowledged;
    bool killed;
  };
  static End finish(const Writer& writer) {
    std::string text;
    char block[4096];
    for (ssize_t count; (count = read(writer.acknowledgements, block, sizeof block)) > 0;)
      text.append(block, static_cast<std::size_t>(count));
    close(writer.acknowledgements);
    int status = -1;
    waitpid(writer.process, &status, 0);
    EXPECT_TRUE(status == 0 || (WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL)) << status;
    End end{{}, WIFSIGNALED(status)};
    for (std::size_t from = 0, to; (to = text.find('\n', from)) != std::string::npos; from = to + 1)
      end.acknowledged.push_back(text.substr(from, to - from));
    return end;
  }

  void expectSoundAndUsable() const {
    OAUTHDBLog next("oauth_log");
    EXPECT_EQ(kErrNone, next.GetErrCode()) << next.GetErrMsg();
    EXPECT_EQ(1, next.Add("after the crash"));
    EXPECT_THAT(query("PRAGMA integrity_check"), ElementsAre("ok"));
    EXPECT_THAT(query("SELECT tab_name, version FROM oauth_meta"),
                ElementsAre("oauth_clientInfo|2", "oauth_grantCode|2", "oauth_token|2"));
  }
};

TEST_F(CrashTest, LosesNoAcknowledgedTokenToKillsAtRandom) {
  writeSettings(R"({"token_max": 10000})");
  const int kills = 300 * rounds();
  std::mt19937 random(20261121);
  std::uniform_int_distribution<int> delay(0, 40'000);  // microseconds
  std::size_t operations = 0;
  for (int kill = 0; kill < kills; ++kill) {
    SCOPED_TRACE(kill);
    const Writer writer = start([](int pipe) {
      while (true) {
        OAUTHDBToken tokens("oauth_token");
        Json::Value result;
        if (tokens.Add("alice", times(64, 'c'), "read", "code", "xyz", "", result) != 0)
          acknowledge(pipe, result["access_token"].asString());
      }
    });
    // On a slow machine, too, every second process has begun to write.
    pollfd acknowledged{writer.acknowledgements, POLLIN, 0};
    if (kill % 2 == 0) {
      EXPECT_EQ(1, poll(&acknowledged, 1, 60'000));
    }
    std::this_thread::sleep_for(std::chrono::microseconds(delay(random)));
    ::kill(writer.process, SIGKILL);
    const End end = finish(writer);
    operations += end.acknowledged.size();

    expectSoundAndUsable();
    const Lines stored = query("SELECT access_token FROM oauth_token");
    EXPECT_THAT(end.acknowledged, IsSubsetOf(stored));
    EXPECT_LE(stored.size(), end.acknowledged.size() + 1);
    if (HasFailure()) return;
    execute("DELETE FROM oauth_token");
  }
  std::cout << "kills: " << kills << ", acknowledged: " << operations << '\n';
  EXPECT_GE(operations, static_cast<std::size_t>(kills / 2));
}

// All operations that write, in an order in which each finds the rows that it needs. Each is one
// transaction, except the registration: its line in the audit log is a second one.
const std::string kRegistered = "oauth_log|Application registed[First]|1";
const std::vector<std::function<int()>> kSteps = {
    [] {
      Json::Value result;
      return OAUTHDBClientInfo("oauth_clientInfo")
          .Add(times(64, 'c'), times(64, 's'), "a.example", "read", "First", "1", result);
    },
    [] { return OAUTHDBClientInfo("oauth_clientInfo").Disable(1); },
    [] {
      Json::Value result;
      return OAUTHDBGrantCode("oauth_grantCode")
          .Add("alice", times(64, 'c'), "read", times(64, 'k'), "1800000000", "xyz", "", result);
    },
    [] { return OAUTHDBGrantCode("oauth_grantCode").Revoke(1); },
    [] { return OAUTHDBGrantCode("oauth_grantCode").Del(1); },
    [] { return issueExpired('a'); },
    [] { return issueExpired('b'); },
    [] { return issueExpired('d'); },
    [] { return OAUTHDBToken("oauth_token").Edit(1, "bob", times(64, 'c'), "w", "code", "abc"); },
    [] { return OAUTHDBToken("oauth_token").Purge(); },
    [] { return OAUTHDBClientInfo("oauth_clientInfo").Del(1); },
};

TEST_F(CrashTest, IsAllOrNothingWhereverTheDiskIsTouched) {
  const FaultyDisk disk;
  std::vector<Lines> states;
  { const OAUTHDBLog first("oauth_log"); }
  states.push_back(everyRow());
  for (const auto& step : kSteps) {
    ASSERT_EQ(1, step()) << states.size();
    states.push_back(everyRow());
  }

  int kills = 0;
  for (;; ++kills) {
    SCOPED_TRACE(kills + 1);
    std::filesystem::remove(files_.database());
    const End end = finish(start([&](int pipe) {
      FaultyDisk::killAt(kills + 1);
      for (const auto& step : kSteps) {
        if (step() != 1) _exit(1);
        acknowledge(pipe, "done");
      }
    }));
    expectSoundAndUsable();
    execute("DELETE FROM oauth_log WHERE msg = 'after the crash'");
    const std::size_t done = end.acknowledged.size();
    if (!end.killed) {
      EXPECT_EQ(kSteps.size(), done);
      break;
    }
    Lines unlogged = states[done + 1];
    unlogged.erase(std::remove(unlogged.begin(), unlogged.end(), kRegistered), unlogged.end());
    const Lines rows = everyRow();
    EXPECT_TRUE(rows == states[done] || rows == states[done + 1] || (done == 0 && rows == unlogged))
        << testing::PrintToString(rows);
    if (HasFailure()) return;
  }
  std::cout << "kills: " << kills << '\n';
  EXPECT_GT(kills, 100);
}

}  // namespace
