// A connection of SQLite's own, for what the library does not offer: copying and checking whole
// databases.

#pragma once

#include <sqlite3.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

namespace oauthctl {

class SqliteError : public std::runtime_error {
 public:
  SqliteError(int code, const std::string& text) : std::runtime_error(text), code_(code) {}
  int code() const { return code_ & 0xFF; }
  bool isDamage() const { return code() == SQLITE_CORRUPT || code() == SQLITE_NOTADB; }
  bool isBusy() const { return code() == SQLITE_BUSY || code() == SQLITE_LOCKED; }

 private:
  int code_;
};

class SqliteConnection {
 public:
  // Waits for other programs about as long as the library does. flags as for sqlite3_open_v2().
  SqliteConnection(const std::string& path, int flags);

  sqlite3* handle() const { return handle_.get(); }

  void run(const std::string& sql);
  // Rows of texts; an SQL NULL is "".
  using Row = std::vector<std::string>;
  std::vector<Row> rows(const std::string& sql);
  // The first value of the first row, "" if there is none.
  std::string value(const std::string& sql);

  [[noreturn]] void fail(int code) const;

 private:
  struct Close {
    void operator()(sqlite3* db) const { sqlite3_close_v2(db); }
  };
  std::unique_ptr<sqlite3, Close> handle_;
};

}  // namespace oauthctl
