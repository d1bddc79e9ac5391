#include "store_test.h"

#include <sqlite3.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <thread>

namespace {

struct CloseConnection {
  void operator()(sqlite3* db) const { sqlite3_close_v2(db); }
};

int collect(void* context, int columns, char** values, char**) {
  std::string row;
  for (int i = 0; i < columns; ++i) {
    if (i > 0) row += '|';
    row += values[i] == nullptr ? "NULL" : values[i];
  }
  static_cast<std::vector<std::string>*>(context)->push_back(row);
  return 0;
}

}  // namespace

void StoreTest::writeSettings(const std::string& text) const {
  std::ofstream(files_.settings(), std::ios::binary) << text;
}

void StoreTest::createDebugMarker() const { std::ofstream(files_.debugMarker()) << ""; }

void StoreTest::runOnThread(const std::function<void()>& body) { std::thread(body).join(); }

Lines StoreTest::query(const std::string& sql) const {
  sqlite3* handle = nullptr;
  const int opened = sqlite3_open_v2(files_.database().c_str(), &handle,
                                     SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
  const std::unique_ptr<sqlite3, CloseConnection> db(handle);
  std::vector<std::string> rows;
  if (opened != SQLITE_OK ||
      sqlite3_exec(handle, sql.c_str(), collect, &rows, nullptr) != SQLITE_OK)
    throw std::runtime_error(std::string(sqlite3_errmsg(handle)) + " in " + sql);
  return rows;
}

void StoreTest::execute(const std::string& sql) const { query(sql); }

int StoreTest::rowCount(const std::string& table) const {
  if (query("SELECT 1 FROM sqlite_master WHERE name='" + table + "'").empty()) return -1;
  return std::stoi(query("SELECT COUNT(*) FROM " + table).front());
}

Lines StoreTest::everyRow() const {
  Lines rows;
  for (const std::string& table : query("SELECT name FROM sqlite_master WHERE type = 'table'")) {
    const bool log = table == "oauth_log";
    for (const std::string& row : query((log ? "SELECT msg, id FROM " : "SELECT * FROM ") + table))
      rows.push_back(std::string(table).append("|").append(row));
  }
  std::sort(rows.begin(), rows.end());
  return rows;
}

void StoreTest::recordEarlierError(ZEVOOAUTHSERVER::OAUTHDBBasic& store) {
  store.SetErrCode(77);
  store.SetErrMsg("earlier");
}

void StoreTest::expectEarlierError(const ZEVOOAUTHSERVER::OAUTHDBBasic& store) {
  expectError(store, 77, "earlier");
}

void StoreTest::expectError(const ZEVOOAUTHSERVER::OAUTHDBBasic& store, int code,
                            const std::string& msg) {
  EXPECT_EQ(code, store.GetErrCode());
  EXPECT_EQ(msg, store.GetErrMsg());
}

int StoreTest::rounds() {
  const char* const value = std::getenv("ZEVOOAUTH_ROUNDS");
  return value == nullptr ? 1 : std::max(1, std::atoi(value));
}

std::string StoreTest::databaseBytes() const {
  std::ifstream file(files_.database(), std::ios::binary);
  std::ostringstream bytes;
  bytes << file.rdbuf();
  return bytes.str();
}
