// A whole database in memory: one moment of a file, checked and changed before any of it is
// written. The tables have ceilings, so that it fits.

#pragma once

#include <string>

#include "content_checks.h"
#include "sqlite_connection.h"

namespace oauthctl {

// In bytes. Four tables at their ceiling of 10000 rows, with the longest values, take less.
constexpr long long kLargestDatabase = 512LL * 1024 * 1024;

class DatabaseImage {
 public:
  // Reads the file at one moment, other programs may go on writing. Throws a SqliteError.
  static DatabaseImage ofFile(const std::string& path);
  // Takes the bytes of a whole file, which no program is writing. Throws a SqliteError.
  static DatabaseImage ofBytes(std::string bytes);

  // No code or token is left in any of its pages.
  void dropGrants();
  // Nor any row that had been deleted in the file, and no other journal mode than the usual one.
  void compact();

  // What makes it no database of ours; empty if it is one.
  Findings problems() { return checkStructure(memory_); }
  CipherCount countCiphers();
  // "2 clients, 1 code, 40 tokens, 33 log lines"
  std::string summary();

  // What a file with these contents holds.
  std::string bytes() const;

  SqliteConnection& connection() { return memory_; }

 private:
  DatabaseImage();

  SqliteConnection memory_;
};

// One copy of all pages, from connection to connection.
class DatabaseCopy {
 public:
  DatabaseCopy(SqliteConnection& from, SqliteConnection& to);
  ~DatabaseCopy();
  DatabaseCopy(const DatabaseCopy&) = delete;
  DatabaseCopy& operator=(const DatabaseCopy&) = delete;

  // Takes the target's exclusive lock, so that nobody reads or writes it until the copy is done.
  void lockTarget() { step(0); }
  // Copies, and commits what was copied. Until then the target is as it was.
  void finish();

 private:
  bool step(int pages);

  sqlite3_backup* backup_;
};

}  // namespace oauthctl
