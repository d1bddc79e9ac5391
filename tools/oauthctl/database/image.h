// A whole database in memory, copied from one moment of a file. It can be checked and changed
// before any of it is written. It fits into memory because every table has a ceiling.

#pragma once

#include <string>

#include "database/sqlite_connection.h"

namespace oauthctl {

// In bytes. Four tables with the largest ceiling and the longest values take less.
inline constexpr long long kLargestDatabase = 512LL * 1024 * 1024;

class DatabaseImage {
 public:
  // Reads the file at one moment. Other programs may go on writing. Throws a SqliteError.
  static DatabaseImage ofFile(const std::string& path);
  // Reads the bytes of a whole file that no program is writing. Throws a SqliteError.
  static DatabaseImage ofBytes(std::string bytes);

  // Removes every code and token, also from unused pages.
  void dropGrants();
  // Removes the remains of deleted rows from unused pages.
  void compact();

  // "2 clients, 1 code, 40 tokens, 33 log lines"
  std::string summary();

  // The bytes of a file with these contents. The journal mode is the usual one.
  std::string bytes() const;

  SqliteConnection& connection() { return memory_; }

 private:
  DatabaseImage();

  SqliteConnection memory_;
};

// Copies all pages from one connection to another.
class DatabaseCopy {
 public:
  DatabaseCopy(SqliteConnection& from, SqliteConnection& to);
  ~DatabaseCopy();
  DatabaseCopy(const DatabaseCopy&) = delete;
  DatabaseCopy& operator=(const DatabaseCopy&) = delete;

  // Takes the exclusive lock of the target: nobody reads or writes it until the copy is done.
  void lockTarget() { step(0); }
  // Copies all pages and commits them. Until then the target does not change.
  void finish();

 private:
  bool step(int pages);

  sqlite3_backup* backup_;
};

}  // namespace oauthctl
