#include "database/sqlite_connection.h"

#include <chrono>
#include <thread>

namespace oauthctl {
namespace {

// SQLite's own busy handler sleeps up to a tenth of a second at a time. Meanwhile programs that
// write all the time could pass the lock to one another, so this one asks more often.
constexpr int kPause = 2, kLongestWait = 5000;  // milliseconds
int waitForLock(void* /*context*/, int times) {
  if (times >= kLongestWait / kPause) return 0;
  std::this_thread::sleep_for(std::chrono::milliseconds(kPause));
  return 1;
}

struct Finalize {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};

}  // namespace

SqliteConnection::SqliteConnection(const std::string& path, int flags) {
  sqlite3* handle = nullptr;
  const int code = sqlite3_open_v2(path.c_str(), &handle, flags, nullptr);
  handle_.reset(handle);
  if (code != SQLITE_OK) fail(code);
  // The schema may be hostile: it comes with the file.
  sqlite3_db_config(handle, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
  sqlite3_db_config(handle, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
  sqlite3_busy_handler(handle, waitForLock, nullptr);
}

void SqliteConnection::fail(int code) const {
  throw SqliteError(code, handle_ ? sqlite3_errmsg(handle()) : sqlite3_errstr(code));
}

void SqliteConnection::run(const std::string& sql) {
  const int code = sqlite3_exec(handle(), sql.c_str(), nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) fail(code);
}

std::vector<SqliteConnection::Row> SqliteConnection::rows(const std::string& sql) {
  sqlite3_stmt* prepared = nullptr;
  const int code = sqlite3_prepare_v2(handle(), sql.c_str(), -1, &prepared, nullptr);
  const std::unique_ptr<sqlite3_stmt, Finalize> statement(prepared);
  if (code != SQLITE_OK) fail(code);
  std::vector<Row> result;
  int step = sqlite3_step(prepared);
  for (; step == SQLITE_ROW; step = sqlite3_step(prepared)) {
    Row row;
    for (int i = 0; i < sqlite3_column_count(prepared); ++i) {
      const void* const bytes = sqlite3_column_blob(prepared, i);
      const auto size = static_cast<std::size_t>(sqlite3_column_bytes(prepared, i));
      row.emplace_back(bytes == nullptr ? "" : static_cast<const char*>(bytes), size);
    }
    result.push_back(std::move(row));
  }
  if (step != SQLITE_DONE) fail(step);
  return result;
}

std::string SqliteConnection::value(const std::string& sql) {
  const std::vector<Row> result = rows(sql);
  return result.empty() || result.front().empty() ? "" : result.front().front();
}

}  // namespace oauthctl
