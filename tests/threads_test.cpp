// Stores on different threads of one process. They are opened and closed one after another, since
// that changes the ids of the whole process. In between, each thread uses its own store.

#include <memory>
#include <mutex>
#include <thread>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using namespace ZEVOOAUTHSERVER;

namespace {

constexpr int kRounds = 20;
std::mutex oneAfterAnother;

template <class Store>
std::shared_ptr<Store> open(const char* table) {
  const std::lock_guard<std::mutex> lock(oneAfterAnother);
  return {new Store(table), [](const Store* store) {
            const std::lock_guard<std::mutex> closing(oneAfterAnother);
            delete store;
          }};
}

std::string verdict(bool ok, const OAUTHDBBasic& store) {
  return ok ? "ok" : store.GetErrMsg() + " [" + std::to_string(store.GetErrCode()) + "]";
}

std::string tradeTokens() {
  const auto tokens = open<OAUTHDBToken>("oauth_token");
  Json::Value issued, who;
  const bool ok = tokens->Add("alice", times(64, 'c'), "read", "code", "xyz", "", issued) != 0 &&
                  tokens->Verify(issued["access_token"].asString(), who) != 0 &&
                  tokens->Revoke(tokens->GetIndex(issued["access_token"].asString())) != 0 &&
                  tokens->Purge() != 0;
  return verdict(ok, *tokens);
}

std::string tradeCodes() {
  const auto codes = open<OAUTHDBGrantCode>("oauth_grantCode");
  Json::Value issued;
  const bool ok = codes->Add("alice", times(64, 'c'), "read", "xyz", "", issued) != 0 &&
                  codes->Del(codes->GetIndex(issued["code"].asString())) != 0;
  return verdict(ok, *codes);
}

std::string registerClient() {
  const auto clients = open<OAUTHDBClientInfo>("oauth_clientInfo");
  Json::Value registered;
  {
    // Opens the audit log as well.
    const std::lock_guard<std::mutex> lock(oneAfterAnother);
    if (clients->Add("a.example", "read", "First", registered) == 0)
      return verdict(false, *clients);
  }
  return verdict(clients->Del(clients->GetIndex(registered["client_id"].asString())) != 0,
                 *clients);
}

std::string note() {
  const auto log = open<OAUTHDBLog>("oauth_log");
  Json::Value rows;
  return verdict(log->Add("noted") != 0 && log->Get("noted", "", &rows) != 0, *log);
}

class ThreadsTest : public StoreTest {};

TEST_F(ThreadsTest, WorkSideBySideOnStoresOfTheirOwn) {
  files_.waitForLocks();
  writeSettings(R"({"log_level": 15})");
  createDebugMarker();
  std::vector<Lines> answers(8);
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < answers.size(); ++i) {
    constexpr std::string (*kWork[])() = {tradeTokens, tradeCodes, registerClient, note};
    threads.emplace_back([work = kWork[i % 4], &answer = answers[i]] {
      for (int round = 0; round < kRounds; ++round) answer.push_back(work());
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_THAT(answers, testing::Each(Lines(kRounds, "ok")));
  EXPECT_EQ(0, rowCount("oauth_token"));
  EXPECT_EQ(0, rowCount("oauth_grantCode"));
  EXPECT_EQ(0, rowCount("oauth_clientInfo"));
  EXPECT_EQ(4 * kRounds, rowCount("oauth_log"));
  EXPECT_THAT(query("SELECT COUNT(*) FROM oauth_meta"), ElementsAre("3"));
}

}  // namespace
