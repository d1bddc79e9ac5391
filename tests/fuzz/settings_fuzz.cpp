// The input is the settings file. Settings must always be within their ranges. If SQLite's JSON
// functions can read the file, they must find the same numbers.

#include <sqlite3.h>

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "oauth_utils.h"
#include "redirected_files.h"
#include "require.h"

namespace {

void write(const std::string& path, const std::string& text) {
  struct Close {
    void operator()(std::FILE* file) const { std::fclose(file); }
  };
  const std::unique_ptr<std::FILE, Close> file(std::fopen(path.c_str(), "wb"));
  require(file && std::fwrite(text.data(), 1, text.size(), file.get()) == text.size(),
          "the settings file can be written");
}

// The settings as SQLite reads them.
class OtherReader {
 public:
  OtherReader() {
    sqlite3_open_v2(":memory:", &db_, SQLITE_OPEN_READWRITE, nullptr);
    valid_ = prepared("SELECT json_valid(?1)");
    // The JSON library refuses a whole document for a number that no double can hold.
    tooLarge_ = prepared(
        "SELECT 1 FROM json_tree(?1)"
        " WHERE type IN ('integer', 'real') AND atom NOT BETWEEN -1e300 AND 1e300");
    // Of members of the same name the last one counts.
    member_ = prepared(
        "SELECT type, atom FROM json_each(?1) WHERE key = ?2 AND json_type(?1) = 'object'"
        " ORDER BY id DESC LIMIT 1");
  }
  ~OtherReader() {
    for (sqlite3_stmt* const statement : {valid_, tooLarge_, member_}) sqlite3_finalize(statement);
    sqlite3_close_v2(db_);
  }
  OtherReader(const OtherReader&) = delete;
  OtherReader& operator=(const OtherReader&) = delete;

  // Whether both readers read the text as a document, and as the same one.
  bool agreesOn(const std::string& text) {
    // One reader refuses deep nesting, or handles some escapes differently.
    if (std::count_if(text.begin(), text.end(), [](char c) { return c == '[' || c == '{'; }) > 900)
      return false;
    for (const char* const escape : {"\\ud", "\\uD", "\\u0000"})
      if (text.find(escape) != std::string::npos) return false;
    return first(valid_, text) && sqlite3_column_int(valid_, 0) == 1 && !first(tooLarge_, text);
  }

  // The integer of 32 bits under the key, 0 for anything else. No value for a real number: the JSON
  // library decides whether that is an integer.
  std::optional<int> integer(const std::string& text, const char* key) {
    sqlite3_reset(member_);
    sqlite3_bind_text(member_, 2, key, -1, SQLITE_STATIC);
    if (!first(member_, text)) return 0;
    const std::string type = reinterpret_cast<const char*>(sqlite3_column_text(member_, 0));
    if (type == "real") return std::nullopt;
    const double value = sqlite3_column_double(member_, 1);
    return type == "integer" && value >= INT_MIN && value <= INT_MAX ? static_cast<int>(value) : 0;
  }

 private:
  sqlite3_stmt* prepared(const char* sql) {
    sqlite3_stmt* statement = nullptr;
    require(sqlite3_prepare_v2(db_, sql, -1, &statement, nullptr) == SQLITE_OK,
            sqlite3_errmsg(db_));
    return statement;
  }
  static bool first(sqlite3_stmt* statement, const std::string& text) {
    sqlite3_reset(statement);
    sqlite3_bind_text(statement, 1, text.data(), static_cast<int>(text.size()), SQLITE_STATIC);
    return sqlite3_step(statement) == SQLITE_ROW;
  }

  sqlite3* db_ = nullptr;
  sqlite3_stmt* valid_;
  sqlite3_stmt* tooLarge_;
  sqlite3_stmt* member_;
};

int levelOfAFreshThread() {
  int level = 0;
  std::thread([&level] { level = getLogLevel(); }).join();
  return level;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const RedirectedFiles files;
  static OtherReader other;
  const std::string text(reinterpret_cast<const char*>(data), size);
  write(files.settings(), text);

  const int period = getExpiredPeriod("token_expired");
  const int rowMax = getTableRowMax("token_max");
  require(period >= 1, "a lifetime is 1 at least");
  require(rowMax >= 1 && rowMax <= 10000, "a ceiling is 1 to 10000");
  const bool comparable = other.agreesOn(text);
  if (comparable) {
    if (const std::optional<int> set = other.integer(text, "token_expired"))
      require(period == (*set > 0 ? *set : 600), "the lifetime is the one set");
    if (const std::optional<int> set = other.integer(text, "token_max"))
      require(rowMax == (*set < 1 ? 1000 : std::min(*set, 10000)), "the ceiling is the one set");
  }
  // A thread takes a hundred times as long as the rest, so only some files are read on one.
  if (size % 256 != 0 || text.find("log_level") == std::string::npos) return 0;
  const int level = levelOfAFreshThread();
  if (comparable)
    if (const std::optional<int> set = other.integer(text, "log_level"))
      require(level == *set, "the level is the one set");
  return 0;
}
