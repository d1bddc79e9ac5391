// The input is the database file, and a file beside it that SQLite may read as a journal. No store
// may crash, every failure must set an error, and a store delivers all rows that SQLite can read.

#include <sqlite3.h>

#include <cstddef>
#include <cstdint>
#include <fstream>
#include <string>

#include "fake_clock.h"
#include "fake_host.h"
#include "fuzz_input.h"
#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "redirected_files.h"
#include "require.h"

using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBLog;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

const std::string kClient(64, 'c'), kCode(64, 'd'), kToken(64, 't');
constexpr long long kIds[] = {1, 3, -1, 6442450943};

void write(const std::string& path, const std::string& bytes) {
  std::ofstream file(path, std::ios::binary);
  require(static_cast<bool>(file << bytes), "the file can be written");
}

int collect(void* context, int columns, char** values, char** names) {
  Json::Value row;
  for (int i = 0; i < columns; ++i) row[names[i]] = values[i] == nullptr ? "" : values[i];
  static_cast<Json::Value*>(context)->append(row);
  return 0;
}

// Runs operations on one store and checks what they leave behind.
class Observer {
 public:
  explicit Observer(OAUTHDBBasic& store) : store_(store) {
    const bool failed = store_.GetErrCode() != kErrNone;
    requireMessage();
    forget();
    ready_ = store_.DBCmd("SELECT 1", nullptr, nullptr) || store_.GetErrCode() != kErrNone;
    require(ready_ || failed, "a store that is not ready says why");
  }

  // A failure must leave an error, unless it is one that is only logged.
  template <class Operation>
  void expectError(Operation operation) {
    if (run(operation) == 0 && ready_)
      require(store_.GetErrCode() != kErrNone, "a failure leaves a code");
  }
  template <class Operation>
  void mayOnlyLog(Operation operation) {
    run(operation);
  }

  // Compares the rows read last with those that the fuzzer's own connection reads. Encrypted values
  // may differ.
  void requireRows(const RedirectedFiles& files, const std::string& table, Json::Value delivered) {
    Json::Value rows(Json::arrayValue);
    sqlite3* db = nullptr;
    sqlite3_open_v2(files.database().c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    const int code = sqlite3_exec(db, ("SELECT * FROM " + table).c_str(), collect, &rows, nullptr);
    sqlite3_close_v2(db);
    // One connection may find damage that the other one does not read.
    if (code != SQLITE_OK || !ready_ || store_.GetErrCode() == SQLITE_CORRUPT) return;
    require(store_.GetErrCode() == kErrNone, "what can be read is delivered");
    for (Json::Value* const document : {&rows, &delivered})
      for (Json::Value& row : *document)
        for (const char* const column : {"client_id", "client_secret"}) row.removeMember(column);
    require(rows == delivered, "rows are delivered as they are");
  }

 private:
  template <class Operation>
  int run(Operation operation) {
    forget();
    const int result = operation();
    require(result == 0 || result == 1, "a result is 0 or 1");
    requireMessage();
    return result;
  }
  void forget() {
    store_.SetErrCode(kErrNone);
    store_.SetErrMsg("");
  }
  void requireMessage() {
    require(store_.GetErrMsg().empty() == (store_.GetErrCode() == kErrNone),
            "a code and a message come together");
  }

  OAUTHDBBasic& store_;
  bool ready_;
};

void useLog(const RedirectedFiles& files) {
  OAUTHDBLog log("oauth_log");
  Observer see(log);
  Json::Value rows;
  see.expectError([&] { return log.Get("a", "ORDER BY id DESC LIMIT 10", &rows); });
  see.expectError([&] { return log.Get("", "", &rows); });
  see.requireRows(files, "oauth_log", rows);
  see.expectError([&] { return log.Add("message"); });
  see.mayOnlyLog([&] { return log.Del(); });
}

void useClients(const RedirectedFiles& files) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Observer see(clients);
  Json::Value rows, result;
  see.expectError([&] { return clients.Get(&rows); });
  see.requireRows(files, "oauth_clientInfo", rows);
  see.expectError([&] { return clients.Get(kClient, &rows); });
  clients.GetIndex(kClient);
  see.expectError([&] { return clients.Add("example.org/cb", "read", "App", result); });
  for (const long long id : kIds) {
    see.expectError([&] { return clients.Get(id, &rows); });
    see.mayOnlyLog([&] { return clients.Edit(id, "example.org", "write", "App 2"); });
    see.mayOnlyLog([&] { return clients.Disable(id); });
    see.mayOnlyLog([&] { return clients.Del(id); });
  }
}

void useCodes(const RedirectedFiles& files) {
  OAUTHDBGrantCode codes("oauth_grantCode");
  Observer see(codes);
  Json::Value rows, result;
  see.expectError([&] { return codes.Get(&rows); });
  see.requireRows(files, "oauth_grantCode", rows);
  see.expectError([&] { return codes.Get(kCode, &rows); });
  codes.GetIndex(kCode);
  see.expectError([&] { return codes.Add("alice", kClient, "read", "xyz", "", result); });
  for (const long long id : kIds) {
    see.expectError([&] { return codes.Get(id, &rows); });
    see.mayOnlyLog([&] { return codes.Edit(id, "bob", kClient, "write", "xyz"); });
    see.mayOnlyLog([&] { return codes.Revoke(id); });
  }
  see.mayOnlyLog([&] { return codes.Purge(); });
  see.mayOnlyLog([&] { return codes.Del(kIds[0]); });
}

void useTokens(const RedirectedFiles& files) {
  OAUTHDBToken tokens("oauth_token");
  Observer see(tokens);
  Json::Value rows, result;
  see.expectError([&] { return tokens.Get(&rows); });
  see.requireRows(files, "oauth_token", rows);
  see.expectError([&] { return tokens.GetWithAccessToken(kToken, &rows); });
  see.expectError([&] { return tokens.GetWithRefreshToken(kToken, &rows); });
  see.mayOnlyLog([&] { return tokens.Verify(kToken, result); });
  tokens.GetIndex(kToken);
  see.expectError([&] { return tokens.Add("alice", kClient, "read", "code", "xyz", "", result); });
  for (const long long id : kIds) {
    see.expectError([&] { return tokens.Get(id, &rows); });
    see.mayOnlyLog([&] { return tokens.Edit(id, "bob", kClient, "write", "code", "xyz"); });
    see.mayOnlyLog([&] { return tokens.Revoke(id); });
  }
  see.mayOnlyLog([&] { return tokens.Purge(); });
}

// The name of the store's table is part of the input, and may be empty.
void useBase(const std::string& table) {
  OAUTHDBBasic store;
  store.SetTabName(table);
  Observer see(store);
  Json::Value rows, request, record;
  record["msg"] = "message";
  see.expectError([&] { return store.DBGetRowCount(&rows); });
  see.mayOnlyLog([&] { return store.DBCheckRowMax(10); });
  see.expectError([&] { return store.DBGet(request, &rows); });
  see.expectError([&] { return store.DBAdd(record); });
  see.mayOnlyLog([&] { return store.IsDBTabExist(table); });
  see.mayOnlyLog([&] { return store.DBDel(request); });
  see.expectError([&] { return store.DBDrop(); });
  see.expectError([&] { return store.DBInit(); });
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const RedirectedFiles files;
  const FakeClock clock;
  const FakeHost host;
  FuzzedDataProvider input(data, size);
  const int use = input.ConsumeIntegralInRange(0, 5);
  const std::string beside = input.PickValueInArray({"", "", "-journal", "-wal"});
  if (!beside.empty()) {
    const auto length = input.ConsumeIntegral<std::uint16_t>();
    write(files.database() + beside, input.ConsumeBytesAsString(length));
  }
  write(files.database(), input.ConsumeRemainingBytesAsString());
  switch (use) {
    case 0:
      useLog(files);
      break;
    case 1:
      useClients(files);
      break;
    case 2:
      useCodes(files);
      break;
    case 3:
      useTokens(files);
      break;
    case 4:
      useBase("oauth_log");
      break;
    default:
      useBase("oauth_meta");
  }
  return 0;
}
