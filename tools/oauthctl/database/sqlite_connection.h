// A direct connection to SQLite, to copy and check whole databases. The library offers no such
// operation.

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
  // Waits for other programs about as long as the library does. The flags are those of
  // sqlite3_open_v2().
  SqliteConnection(const std::string& path, int flags);

  sqlite3* handle() const { return handle_.get(); }

  void run(const std::string& sql);
  // Rows of texts; an SQL NULL becomes "".
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
