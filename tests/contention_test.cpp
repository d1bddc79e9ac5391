// Many processes use one file. No change may be lost, and none may happen twice.
//
// ZEVOOAUTH_ROUNDS multiplies the work, for longer runs by hand.

#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using namespace ZEVOOAUTHSERVER;

namespace {

class ContentionTest : public StoreTest {
 protected:
  ContentionTest() {
    files_.waitForLocks();
    writeSettings(R"({"token_max": 10000, "grantcode_max": 10000})");
  }

  // Starts a process that runs the body and records what it returns.
  void start(const std::function<Lines()>& body) {
    const std::string file = files_.directory() + "/answer-" + std::to_string(processes_.size());
    const pid_t child = fork();
    if (child == 0) {
      char go;
      close(gate_[1]);
      while (read(gate_[0], &go, 1) > 0) continue;  // until the parent opens it
      std::ofstream answers(file);
      for (const std::string& answer : body()) answers << answer << '\n';
      answers.close();
      _exit(answers ? 0 : 1);
    }
    if (child < 0) throw std::runtime_error("cannot fork");
    processes_.push_back({child, file});
  }

  // Lets all processes run at once, and collects what they recorded.
  std::vector<Lines> finish() {
    close(gate_[0]);
    close(gate_[1]);
    std::vector<Lines> answers;
    for (const auto& [child, file] : processes_) {
      int status = -1;
      waitpid(child, &status, 0);
      EXPECT_EQ(0, status);
      std::ifstream lines(file);
      answers.emplace_back();
      for (std::string line; std::getline(lines, line);) answers.back().push_back(line);
      std::filesystem::remove(file);
    }
    processes_.clear();
    EXPECT_EQ(0, pipe(gate_));
    return answers;
  }
  void SetUp() override { ASSERT_EQ(0, pipe(gate_)); }

 private:
  struct Process {
    pid_t child;
    std::string file;
  };
  std::vector<Process> processes_;
  int gate_[2] = {-1, -1};
};

std::string reason(const OAUTHDBBasic& store) {
  return "failed: " + store.GetErrMsg() + " [" + std::to_string(store.GetErrCode()) + "]";
}

Lines issueTokens(int count) {
  Lines issued;
  for (int i = 0; i < count; ++i) {
    OAUTHDBToken tokens("oauth_token");
    Json::Value result;
    const bool ok = tokens.Add("alice", times(64, 'c'), "read", "code", "xyz", "", result) != 0;
    issued.push_back(ok ? result["access_token"].asString() : reason(tokens));
  }
  return issued;
}

TEST_F(ContentionTest, LosesNoTokenAmongIssuersVerifiersPurgers) {
  const int count = 200 * rounds();
  const Lines live = issueTokens(1);
  for (int i = 0; i < 8; ++i) start([count] { return issueTokens(count); });
  for (int i = 0; i < 2; ++i)
    start([&live, count] {
      Lines answers;
      for (int n = 0; n < count; ++n) {
        OAUTHDBToken tokens("oauth_token");
        Json::Value who;
        answers.push_back(tokens.Verify(live[0], who) != 0 ? who["username"].asString()
                                                           : reason(tokens));
      }
      return answers;
    });
  start([count] {
    Lines answers;
    for (int n = 0; n < count / 10; ++n) {
      OAUTHDBToken tokens("oauth_token");
      answers.push_back(tokens.Purge() != 0 ? "purged" : reason(tokens));
    }
    return answers;
  });
  const std::vector<Lines> answers = finish();

  std::vector<std::string> acknowledged = live;
  for (int i = 0; i < 8; ++i)
    acknowledged.insert(acknowledged.end(), answers[i].begin(), answers[i].end());
  std::vector<std::string> stored = query("SELECT access_token FROM oauth_token");
  std::sort(acknowledged.begin(), acknowledged.end());
  std::sort(stored.begin(), stored.end());
  EXPECT_EQ(static_cast<std::size_t>(8 * count + 1), stored.size());
  EXPECT_EQ(acknowledged, stored);
  EXPECT_EQ(Lines(static_cast<std::size_t>(count), "alice"), answers[8]);
  EXPECT_EQ(Lines(static_cast<std::size_t>(count), "alice"), answers[9]);
  EXPECT_EQ(Lines(static_cast<std::size_t>(count / 10), "purged"), answers[10]);
}

TEST_F(ContentionTest, CreatesTheSchemaOnce) {
  for (int repetition = 0; repetition < 50 * rounds(); ++repetition) {
    SCOPED_TRACE(repetition);
    for (int i = 0; i < 16; ++i)
      start([] {
        OAUTHDBLog log("oauth_log");
        return Lines{log.DBCheckRowMax(1) ? "ready" : reason(log)};
      });
    for (const Lines& answer : finish()) EXPECT_THAT(answer, ElementsAre("ready"));
    EXPECT_THAT(query("SELECT name FROM sqlite_master WHERE type='table' ORDER BY name"),
                ElementsAre("oauth_clientInfo", "oauth_grantCode", "oauth_log", "oauth_meta",
                            "oauth_token"));
    EXPECT_THAT(query("SELECT tab_name, version FROM oauth_meta"),
                ElementsAre("oauth_clientInfo|2", "oauth_grantCode|2", "oauth_token|2"));
    std::filesystem::remove(files_.database());
  }
}

// A server may issue tokens for a code only in the process that deleted it.
template <class Store>
Lines claim(const char* table, const std::vector<long long>& ids, int (Store::*take)(long long)) {
  Lines won;
  for (const long long id : ids) {
    Store store(table);
    if ((store.*take)(id) != 0)
      won.push_back(std::to_string(id));
    else if (store.GetErrCode() != kErrNone)
      won.push_back(reason(store));
  }
  return won;
}

class ExactlyOnceTest : public ContentionTest {
 protected:
  // Eight processes try every id. Returns how many of them succeeded with each.
  template <class Store>
  std::map<std::string, int> race(const char* table, int (Store::*take)(long long)) {
    std::vector<long long> ids;
    for (const std::string& id : query(std::string("SELECT id FROM ") + table))
      ids.push_back(std::stoll(id));
    for (int i = 0; i < 8; ++i) start([&] { return claim(table, ids, take); });
    std::map<std::string, int> wins;
    for (const Lines& answer : finish())
      for (const std::string& id : answer) ++wins[id];
    return wins;
  }
  static std::map<std::string, int> eachOnce(int count) {
    std::map<std::string, int> wins;
    for (int id = 1; id <= count; ++id) wins[std::to_string(id)] = 1;
    return wins;
  }
  void issueCodes(int count) const {
    OAUTHDBGrantCode codes("oauth_grantCode");
    Json::Value result;
    for (int i = 0; i < count; ++i) codes.Add("alice", times(64, 'c'), "read", "xyz", "", result);
  }
};

TEST_F(ExactlyOnceTest, SpendsACodeByDeletingIt) {
  const int count = 200 * rounds();
  issueCodes(count);
  EXPECT_EQ(eachOnce(count), race("oauth_grantCode", &OAUTHDBGrantCode::Del));
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
}

TEST_F(ExactlyOnceTest, RotatesARefreshTokenByRevokingIt) {
  const int count = 200 * rounds();
  issueTokens(count);
  EXPECT_EQ(eachOnce(count), race("oauth_token", &OAUTHDBToken::Revoke));
  EXPECT_EQ(0, rowCount("oauth_token"));
}

// Revoking a code only moves its expiry: every process succeeds, so it claims nothing.
TEST_F(ExactlyOnceTest, IsNotGuaranteedByRevokingACode) {
  issueCodes(5);
  std::map<std::string, int> everyone;
  for (int id = 1; id <= 5; ++id) everyone[std::to_string(id)] = 8;
  EXPECT_EQ(everyone, race("oauth_grantCode", &OAUTHDBGrantCode::Revoke));
}

}  // namespace
