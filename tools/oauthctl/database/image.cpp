#include "database/image.h"

#include <memory>

#include "decimal_text.h"
#include "oauth_names.h"
#include "terminal/terminal.h"

namespace oauthctl {

namespace table = ZEVOOAUTHSERVER::names::table;

namespace {

// Sets the two bytes of the header that hold the journal mode. SQLite opens no write-ahead database
// in memory, and a backup must not change the journal mode of the server.
void chooseRollbackJournal(std::string& bytes) {
  constexpr std::size_t kWriteVersion = 18, kReadVersion = 19;
  constexpr char kRollback = 1, kWriteAhead = 2;
  for (const std::size_t at : {kWriteVersion, kReadVersion})
    if (at < bytes.size() && bytes[at] == kWriteAhead) bytes[at] = kRollback;
}

void requireFittingSize(SqliteConnection& source) {
  const std::string bytes =
      source.value("SELECT page_count * page_size FROM pragma_page_count, pragma_page_size");
  if (ZEVOOAUTHSERVER::decimalNumber(bytes).value_or(0) > kLargestDatabase)
    throw SqliteError(SQLITE_TOOBIG, "it is too large for a database of the server");
}

}  // namespace

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

DatabaseImage::DatabaseImage() : memory_(":memory:", SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE) {}

// The source stays in one read transaction: otherwise the copy would start again after every commit
// of another program.
DatabaseImage DatabaseImage::ofFile(const std::string& path) {
  DatabaseImage image;
  SqliteConnection source(path, SQLITE_OPEN_READONLY);
  source.run("BEGIN; SELECT 1 FROM sqlite_master;");
  requireFittingSize(source);
  DatabaseCopy(source, image.memory_).finish();
  return image;
}

DatabaseImage DatabaseImage::ofBytes(std::string bytes) {
  DatabaseImage image;
  if (bytes.empty()) return image;
  chooseRollbackJournal(bytes);
  SqliteConnection source(":memory:", SQLITE_OPEN_READWRITE);
  const auto size = static_cast<sqlite3_int64>(bytes.size());
  const int code =
      sqlite3_deserialize(source.handle(), "main", reinterpret_cast<unsigned char*>(bytes.data()),
                          size, size, SQLITE_DESERIALIZE_READONLY);
  if (code != SQLITE_OK) source.fail(code);
  DatabaseCopy(source, image.memory_).finish();
  return image;
}

void DatabaseImage::dropGrants() {
  for (const std::string table : {table::kGrantCode, table::kToken})
    memory_.run("DELETE FROM " + table);
  compact();
}

void DatabaseImage::compact() { memory_.run("PRAGMA temp_store = MEMORY; VACUUM;"); }

std::string DatabaseImage::summary() {
  const auto countOf = [this](const char* table, const char* word) {
    const std::string count = memory_.value(std::string("SELECT COUNT(*) FROM ") + table);
    return count + " " + word + (count == "1" ? "" : "s");
  };
  return countOf(table::kClientInfo, "client") + ", " + countOf(table::kGrantCode, "code") + ", " +
         countOf(table::kToken, "token") + ", " + countOf(table::kLog, "log line");
}

std::string DatabaseImage::bytes() const {
  struct Free {
    void operator()(unsigned char* bytes) const { sqlite3_free(bytes); }
  };
  sqlite3_int64 size = 0;
  const std::unique_ptr<unsigned char, Free> serialized(
      sqlite3_serialize(memory_.handle(), "main", &size, 0));
  if (!serialized) memory_.fail(SQLITE_NOMEM);
  std::string result(reinterpret_cast<const char*>(serialized.get()),
                     static_cast<std::size_t>(size));
  chooseRollbackJournal(result);
  return result;
}

}  // namespace oauthctl
