#include "database_image.h"

#include "terminal.h"

namespace oauthctl {

DatabaseCopy::DatabaseCopy(SqliteConnection& from, SqliteConnection& to)
    : backup_(sqlite3_backup_init(to.handle(), "main", from.handle(), "main")) {
  if (backup_ == nullptr) to.fail(sqlite3_errcode(to.handle()));
}

DatabaseCopy::~DatabaseCopy() { sqlite3_backup_finish(backup_); }

// True while there is more to copy.
bool DatabaseCopy::step(int pages) {
  const int code = sqlite3_backup_step(backup_, pages);
  if (code == SQLITE_OK) return true;
  if (code == SQLITE_DONE) return false;
  throw SqliteError(code, sqlite3_errstr(code));
}

void DatabaseCopy::finish() {
  constexpr int kPages = 64;
  bool more = step(kPages);
  Progress progress("copying pages", static_cast<std::size_t>(sqlite3_backup_pagecount(backup_)));
  while (more) {
    progress.update(static_cast<std::size_t>(sqlite3_backup_pagecount(backup_) -
                                             sqlite3_backup_remaining(backup_)));
    more = step(kPages);
  }
}

// The source stays in one read transaction: otherwise every commit of another program between two
// steps would start the copy anew.
DatabaseImage::DatabaseImage(const std::string& path)
    : memory_(":memory:", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE) {
  SqliteConnection source(path, SQLITE_OPEN_READONLY);
  source.run("BEGIN; SELECT 1 FROM sqlite_master;");
  DatabaseCopy(source, memory_).finish();
}

void DatabaseImage::dropGrants() {
  memory_.run("DELETE FROM oauth_grantCode; DELETE FROM oauth_token;");
  compact();
}

void DatabaseImage::compact() { memory_.run("PRAGMA temp_store = MEMORY; VACUUM;"); }

CipherCount DatabaseImage::countCiphers() {
  CipherCount count;
  checkCiphers(memory_, count);
  return count;
}

std::string DatabaseImage::summary() {
  const auto counted = [this](const char* table, const char* word) {
    const std::string count = memory_.value(std::string("SELECT COUNT(*) FROM ") + table);
    return count + " " + word + (count == "1" ? "" : "s");
  };
  return counted("oauth_clientInfo", "client") + ", " + counted("oauth_grantCode", "code") + ", " +
         counted("oauth_token", "token") + ", " + counted("oauth_log", "log line");
}

void DatabaseImage::writeTo(const std::string& path) {
  SqliteConnection target(path, SQLITE_OPEN_READWRITE);
  // Nobody else knows the file yet: no journal is needed, and it is synchronised when it is whole.
  target.run("PRAGMA journal_mode = MEMORY; PRAGMA synchronous = OFF;");
  DatabaseCopy(memory_, target).finish();
}

}  // namespace oauthctl
