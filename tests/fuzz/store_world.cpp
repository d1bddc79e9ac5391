#include "store_world.h"

#include <sqlite3.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <set>
#include <string_view>
#include <utility>
#include <vector>

#include "require.h"

using ZEVOOAUTHSERVER::OAUTHDBBasic;

namespace {

constexpr char kSettings[] = R"({"client_info_max": 5, "grantcode_max": 5, "token_max": 5,
 "log_max": 4, "grantcode_expired": 60, "token_expired": 60, "log_level": 15})";

std::int64_t databaseClock;  // Unix seconds

int currentTime(sqlite3_vfs*, sqlite3_int64* milliseconds) {
  constexpr std::int64_t kJulianDayOfTheEpoch = 210866760000;  // seconds
  *milliseconds = (kJulianDayOfTheEpoch + databaseClock) * 1000;
  return SQLITE_OK;
}

// A second row. The low 32 bits of the id after it are the smallest int. The unique value ends in
// another character.
Row second(Row row, const std::string& unique) {
  row["id"] = "6442450943";
  row[unique].back() = '2';
  return row;
}

Rows two(const Row& row, const std::string& unique) {
  return {{3, row}, {6442450943, second(row, unique)}};
}

// The rows of every table at the start.
std::map<std::string, Rows> firstRows() {
  const std::string sealed = FakeHost::sealed(std::string(64, 'c'));
  const Row client = {{"enable", "1"},
                      {"client_id", sealed},
                      {"client_secret", sealed},
                      {"redirect_uri", "here"},
                      {"scope", "read"},
                      {"display_name", "App"},
                      {"id", "3"}};
  Row code = {{"username", "alice"},
              {"client_id", sealed},
              {"scope", "read"},
              {"expired_time", "1700000060"},
              {"state", "xyz"},
              {"ip", "192.0.2.7"},
              {"id", "3"}};
  Row token = code;
  code["code"] = std::string(64, 'd');
  token["refresh_token"] = std::string(64, 'r');
  token["access_token"] = std::string(64, 't');
  token["flow_type"] = "code";
  const Row line = {{"timestamp", "1600000000"}, {"msg", "100% a_b"}, {"id", "3"}};
  return {{"oauth_clientInfo", two(client, "client_id")},
          {"oauth_grantCode", two(code, "code")},
          {"oauth_token", two(token, "access_token")},
          {"oauth_log", two(line, "msg")}};
}

std::string sealedIf(const std::string& column, const std::string& value) {
  const bool sensitive = column == "client_id" || column == "client_secret";
  return sensitive ? FakeHost::sealed(value) : value;
}

// As the file holds them.
Row stored(const Values& values) {
  Row row;
  for (const auto& [column, value] : values.asGiven) row[column] = sealedIf(column, value);
  for (const auto& [column, value] : values.quoted) row[column] = sealedIf(column, doubled(value));
  return row;
}

std::string_view columnText(sqlite3_stmt* row, int column) {
  const unsigned char* const text = sqlite3_column_text(row, column);
  const auto size = static_cast<std::size_t>(sqlite3_column_bytes(row, column));
  return {reinterpret_cast<const char*>(text), size};
}

// The database in memory. It exists as long as a connection is open, which this object keeps.
class Database {
 public:
  static Database& get() {
    static Database database;
    return database;
  }

  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;

  const std::string& directory() const { return directory_; }
  const std::map<std::string, Rows>& first() const { return first_; }

  // Back to the first rows.
  void reset() {
    for (const std::string& sql : reset_) each(sql, [](sqlite3_stmt*) {});
  }

  // Hands every row of the statement to the body; the text is its parameter, if it has one.
  template <class Body>
  void each(const std::string& sql, Body body, const std::string& parameter = {}) {
    sqlite3_stmt*& statement = statements_[sql];
    if (statement == nullptr)
      require(sqlite3_prepare_v2(db_, sql.c_str(), -1, &statement, nullptr) == SQLITE_OK,
              sqlite3_errmsg(db_));
    sqlite3_bind_text(statement, 1, parameter.c_str(), -1, SQLITE_STATIC);
    int code;
    while ((code = sqlite3_step(statement)) == SQLITE_ROW) body(statement);
    require(code == SQLITE_DONE, sqlite3_errmsg(db_));
    sqlite3_reset(statement);
  }

  void requireSchema() { require(schema() == schema_, "the schema and its versions stay"); }

 private:
  Database() {
    // Every connection to the same path shares one database in memory, whose time is databaseClock.
    static sqlite3_vfs vfs = *sqlite3_vfs_find("memdb");
    vfs.zName = "fuzz";
    vfs.xCurrentTimeInt64 = currentTime;
    sqlite3_vfs_register(&vfs, 1);

    directory_ = std::filesystem::temp_directory_path() / "zevooauth-fuzz-XXXXXX";
    require(mkdtemp(directory_.data()) != nullptr, "a directory can be made");
    const RedirectedFiles files(directory_);
    std::ofstream(files.settings()) << kSettings;
    std::ofstream(files.debugMarker()) << "";
    sqlite3_open_v2(files.database().c_str(), &db_, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE,
                    nullptr);
    const OAUTHDBBasic creates;
    schema_ = schema();
    first_ = firstRows();
    reset_.emplace_back("BEGIN");
    for (const auto& [table, rows] : first_) {
      reset_.push_back("DELETE FROM " + table);
      for (const auto& [id, row] : rows) reset_.push_back(insertion(table, row));
    }
    reset_.emplace_back("COMMIT");
  }

  ~Database() {
    for (const auto& [sql, statement] : statements_) sqlite3_finalize(statement);
    sqlite3_close_v2(db_);
    std::filesystem::remove_all(directory_);
  }

  static std::string insertion(const std::string& table, const Row& row) {
    std::string columns, values;
    for (const auto& [column, value] : row) {
      columns += (columns.empty() ? "" : ",") + column;
      values += (values.empty() ? "'" : ",'") + value + "'";
    }
    return "INSERT INTO " + table + "(" + columns + ") VALUES(" + values + ")";
  }

  std::string schema() {
    std::string text;
    for (const char* const table : {"sqlite_master", "oauth_meta"})
      each(std::string("SELECT * FROM ") + table, [&text](sqlite3_stmt* row) {
        for (int i = 0; i < sqlite3_column_count(row); ++i) {
          text += columnText(row, i);
          text += '|';
        }
      });
    return text;
  }

  std::string directory_;
  sqlite3* db_ = nullptr;
  std::map<std::string, sqlite3_stmt*> statements_;
  std::map<std::string, Rows> first_;
  std::vector<std::string> reset_;
  std::string schema_;
};

}  // namespace

StoreWorld::StoreWorld(FuzzedDataProvider& input)
    : input_(input), files_(Database::get().directory()), tables_(Database::get().first()) {
  databaseClock = 1'700'000'000;
  Database::get().reset();
}

// Notes the error if a value as given holds a NUL byte.
bool StoreWorld::refused(const Row& asGiven) {
  std::vector<std::string> values;
  for (const auto& [column, value] : asGiven) {
    if (column == "client_id" && hasNul(value)) return fail(-4, "Data Encrypt failed") == 0;
    if (column != "client_id") values.push_back(value);
  }
  const std::string refusal = refusalOf(values);
  return !refusal.empty() && fail(1, refusal) == 0;
}

int StoreWorld::insert(const std::string& table, const std::string& unique, const Values& values) {
  if (refused(values.asGiven)) return 0;
  Row row = stored(values);
  for (const auto& [id, other] : rows(table))
    if (other.at(unique) == row.at(unique))
      return fail(19, "UNIQUE constraint failed: " + table + "." + unique);
  add(table, std::move(row));
  return 1;
}

int StoreWorld::update(const std::string& table, std::int64_t id, const Values& values) {
  if (refused(values.asGiven)) return 0;
  const auto row = rows(table).find(id);
  if (row == rows(table).end()) return 0;
  for (const auto& [column, value] : stored(values)) row->second[column] = value;
  return 1;
}

std::int64_t StoreWorld::expectFound(const OAUTHDBBasic& store, const std::string& table,
                                     const Json::Value& delivered, int success,
                                     const std::string& column, const std::string& text,
                                     bool asGiven) {
  if (!fits(text, 64, 64)) {
    expect(store, success, fail(-2, "Bad parameters"));
    return 0;
  }
  if (asGiven && hasNul(text)) {
    expect(store, success, fail(1, refusalOf({text})));
    return 0;
  }
  expect(store, success, 1);
  const std::string kept = sealedIf(column, asGiven ? text : doubled(text));
  std::int64_t found = 0;
  expectRows(table, delivered, [&](const Row& row) {
    if (row.at(column) != kept) return false;
    found = number(row.at("id"));
    return true;
  });
  return found;
}

void StoreWorld::add(const std::string& table, Row row) {
  Rows& all = rows(table);
  const std::int64_t id = all.empty() ? 1 : all.rbegin()->first + 1;
  row["id"] = std::to_string(id);
  all[id] = std::move(row);
}

// A line beyond the ceiling is deleted, and with it all lines of the same second.
void StoreWorld::addToLog(const std::string& msg) {
  add("oauth_log", {{"timestamp", std::to_string(databaseClock)}, {"msg", doubled(msg)}});
  Rows& lines = rows("oauth_log");
  std::vector<std::int64_t> times;
  for (const auto& [id, line] : lines) times.push_back(number(line.at("timestamp")));
  std::sort(times.begin(), times.end(), std::greater<>());
  std::set<std::int64_t> gone;
  for (std::size_t i = kLogMax; i < times.size(); ++i) gone.insert(times[i]);
  for (auto line = lines.begin(); line != lines.end();)
    line =
        gone.count(number(line->second.at("timestamp"))) > 0 ? lines.erase(line) : std::next(line);
}

void StoreWorld::dropExpired(const std::string& table) {
  Rows& all = rows(table);
  for (auto row = all.begin(); row != all.end();)
    row = now() > number(row->second.at("expired_time")) ? all.erase(row) : std::next(row);
}

int StoreWorld::fail(int code, const std::string& msg) {
  code_ = code;
  msg_ = msg;
  return 0;
}

void StoreWorld::expect(const OAUTHDBBasic& store, int result, int expected) const {
  if (result != expected)
    finding("the result is " + std::to_string(expected) + ", not " + std::to_string(result) + " (" +
            store.GetErrMsg() + ")");
  if (store.GetErrCode() != code_ || store.GetErrMsg() != msg_)
    finding("the error is " + std::to_string(code_) + " " + msg_ + ", not " +
            std::to_string(store.GetErrCode()) + " " + store.GetErrMsg());
  for (const auto& [table, rows] : tables_) expectTable(table, rows);
  Database::get().requireSchema();
}

void StoreWorld::expectTable(const std::string& table, const Rows& rows) {
  auto next = rows.begin();
  Database::get().each("SELECT * FROM " + table + " ORDER BY id", [&](sqlite3_stmt* row) {
    if (next == rows.end()) finding(table + " has no more rows");
    const Row& expected = next->second;
    require(static_cast<std::size_t>(sqlite3_column_count(row)) == expected.size(),
            "a table has its columns");
    for (int i = 0; i < sqlite3_column_count(row); ++i) {
      const auto value = expected.find(sqlite3_column_name(row, i));
      require(value != expected.end(), "a table has its columns");
      if (columnText(row, i) != value->second)
        finding(table + " holds " + value->second + " in " + value->first + ", not " +
                std::string(columnText(row, i)));
    }
    ++next;
  });
  if (next != rows.end()) finding(table + " lacks no row");
}

Json::Value StoreWorld::plain(const Row& row) {
  Json::Value result;
  for (const auto& [column, value] : row) result[column] = value;
  for (const char* const column : {"client_id", "client_secret"}) {
    if (!result.isMember(column)) continue;
    const std::string sealed = row.at(column).substr(FakeHost::sealed("").size());
    result[column] = std::string(sealed.rbegin(), sealed.rend());
  }
  return result;
}

void StoreWorld::requireEqual(const Json::Value& actual, const Json::Value& expected) {
  if (actual != expected)
    finding("delivered is\n" + expected.toStyledString() + "not\n" + actual.toStyledString());
}

std::int64_t StoreWorld::anyId(const std::string& table) {
  const Rows& all = rows(table);
  const auto choice = input_.ConsumeIntegralInRange<std::size_t>(0, all.size());
  return choice < all.size() ? std::next(all.begin(), static_cast<long>(choice))->first
                             : input_.ConsumeIntegral<std::int64_t>();
}

void StoreWorld::moveClock() {
  constexpr std::int64_t kLatest = 4'000'000'000;  // past January 2038
  if (input_.ConsumeBool())
    clock_.set(input_.ConsumeIntegralInRange<std::int64_t>(1, kLatest));
  else
    databaseClock = input_.ConsumeIntegralInRange<std::int64_t>(0, kLatest);
}

Json::Value StoreWorld::linesLike(const std::string& pattern, const std::string& option) {
  Json::Value lines(Json::arrayValue);
  const auto append = [&lines](sqlite3_stmt* row) {
    Json::Value line;
    for (int i = 0; i < sqlite3_column_count(row); ++i)
      line[sqlite3_column_name(row, i)] = std::string(columnText(row, i));
    lines.append(line);
  };
  Database::get().each("SELECT * FROM oauth_log WHERE msg LIKE ?1 " + option, append, pattern);
  return lines;
}
