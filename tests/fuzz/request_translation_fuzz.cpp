// Hostile documents for the translation of requests into SQL. The fragments must be exactly what
// the rules say, and SQLite must read the same values from them.

#include <json/value.h>
#include <sqlite3.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>

#include "fuzz_input.h"
#include "oauth_db_basic.h"
#include "redirected_files.h"
#include "require.h"

using ZEVOOAUTHSERVER::OAUTHDBBasic;

namespace {

constexpr const char* kColumns[] = {"a", "b", "c", "client_id", "timestamp"};

double anyDouble(FuzzedDataProvider& input) {
  const auto bits = input.ConsumeIntegral<std::uint64_t>();
  double value;
  std::memcpy(&value, &bits, sizeof value);
  return value;
}

Json::Value anyValue(FuzzedDataProvider& input) {
  switch (input.ConsumeIntegralInRange(0, 15)) {
    case 0:
      return static_cast<Json::Int64>(input.ConsumeIntegral<std::int64_t>());
    case 1:
      return static_cast<Json::UInt64>(input.ConsumeIntegral<std::uint64_t>());
    case 2:
      return anyDouble(input);
    case 3:
      return input.ConsumeBool();
    case 4:
      return Json::nullValue;
    case 5:
      return input.ConsumeBool() ? Json::arrayValue : Json::objectValue;
    case 6: {
      Json::Value nested;
      nested["a"] = input.ConsumeRandomLengthString();
      return nested;
    }
    default:
      return input.ConsumeRandomLengthString();
  }
}

// Names of columns, or any text. Such a text is not given to SQLite, since names are not escaped.
Json::Value anyDocument(FuzzedDataProvider& input, bool& ofColumns) {
  const int kind = input.ConsumeIntegralInRange(0, 31);
  if (kind == 1) return anyValue(input);
  Json::Value document(kind == 2 ? Json::arrayValue : Json::objectValue);
  if (kind == 2) ofColumns = false;
  for (int members = input.ConsumeIntegralInRange(0, 4); members > 0; --members) {
    if (kind == 2) {
      document.append(anyValue(input));
    } else if (kind == 3) {
      ofColumns = false;
      document[input.ConsumeRandomLengthString(20)] = anyValue(input);
    } else {
      document[input.PickValueInArray(kColumns)] = anyValue(input);
    }
  }
  return document;
}

// --- The rules ---

// The value between single quotes, with each single quote in it doubled.
std::string literal(const Json::Value& value) {
  std::string result = "'";
  for (const char c : value.asString()) result.append(c == '\'' ? 2 : 1, c);
  return result + "'";
}

std::string pair(const std::string& name, const Json::Value& value) {
  return name + "=" + literal(value);
}

std::string pairs(const Json::Value& values, const std::string& separator) {
  std::string result;
  const auto add = [&](const std::string& next) {
    result += (result.empty() ? "" : separator) + next;
  };
  if (values.isObject())
    for (const std::string& name : values.getMemberNames()) add(pair(name, values[name]));
  if (values.isArray())
    for (const Json::Value& value : values) add(pair("", value));
  return result;
}

std::string where(const Json::Value& condition) {
  const bool nothing = condition.isNull() || (condition.isObject() && condition.size() == 0);
  return nothing ? "" : " WHERE " + pairs(condition, " and ");
}

std::string insertion(const Json::Value& record) {
  std::string names, values;
  const auto add = [&](const std::string& name, const Json::Value& value) {
    const std::string comma = names.empty() ? "" : ", ";
    names += comma + name;
    values += comma;
    if (value.isNull())
      values += name == "timestamp" ? "strftime('%s','now')" : "NULL";
    else
      values += literal(value);
  };
  if (record.isObject())
    for (const std::string& name : record.getMemberNames()) add(name, record[name]);
  if (record.isArray())
    for (const Json::Value& value : record) add("", value);
  return " (" + names + ") VALUES(" + values + ")";
}

// What the translation gives, or nothing if a value has no text.
template <class Translation>
std::optional<std::string> textFrom(Translation translation) {
  try {
    return translation();
  } catch (const Json::LogicError&) {
    return std::nullopt;
  }
}

// The fragment, after a comparison with that of the rules.
template <class Translation, class Rule>
std::optional<std::string> compared(Translation translation, Rule rule) {
  std::optional<std::string> actual = textFrom(translation);
  const std::optional<std::string> expected = textFrom(rule);
  if (actual != expected)
    finding("the SQL is " + expected.value_or("refused") + ", not " + actual.value_or("refused"));
  return actual;
}

// --- SQLite ---

class Scratch {
 public:
  Scratch() {
    sqlite3_open_v2(":memory:", &db_, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
    run("CREATE TABLE t(a, b, c, client_id, timestamp)");
  }
  ~Scratch() { sqlite3_close_v2(db_); }
  Scratch(const Scratch&) = delete;
  Scratch& operator=(const Scratch&) = delete;

  // Runs the text, which must be one statement; the number of rows that it changed.
  int run(const std::string& sql) {
    step(sql, [](sqlite3_stmt*) {});
    return sqlite3_changes(db_);
  }
  // Whether SQLite finds no statement in the text.
  bool refuses(const std::string& sql) {
    sqlite3_stmt* statement = nullptr;
    const int code = sqlite3_prepare_v2(db_, sql.c_str(), -1, &statement, nullptr);
    sqlite3_finalize(statement);
    return code == SQLITE_ERROR;
  }
  int count(const std::string& condition) {
    int rows = 0;
    step("SELECT 1 FROM t" + condition, [&rows](sqlite3_stmt*) { ++rows; });
    return rows;
  }
  // Requires the row to hold the document's values.
  void requireValues(const Json::Value& document, bool nullIsEmpty) {
    step("SELECT * FROM t", [&](sqlite3_stmt* row) {
      for (int i = 0; i < sqlite3_column_count(row); ++i) {
        const std::string name = sqlite3_column_name(row, i);
        if (document.isMember(name)) requireValue(row, i, name, document[name], nullIsEmpty);
      }
    });
  }

 private:
  static void requireValue(sqlite3_stmt* row, int column, const std::string& name,
                           const Json::Value& value, bool nullIsEmpty) {
    const int type = sqlite3_column_type(row, column);
    if (value.isNull() && !nullIsEmpty)
      return require(type == (name == "timestamp" ? SQLITE_TEXT : SQLITE_NULL),
                     "a null is NULL or the time");
    const auto* const bytes = static_cast<const char*>(sqlite3_column_blob(row, column));
    const std::string text(bytes == nullptr ? "" : bytes,
                           static_cast<std::size_t>(sqlite3_column_bytes(row, column)));
    if (type != SQLITE_TEXT || text != value.asString())
      finding("SQLite reads " + text + " instead of " + value.asString());
  }

  template <class Body>
  void step(const std::string& sql, Body body) {
    sqlite3_stmt* statement = nullptr;
    const char* rest = nullptr;
    if (sqlite3_prepare_v2(db_, sql.c_str(), -1, &statement, &rest) != SQLITE_OK)
      finding(std::string(sqlite3_errmsg(db_)) + " in " + sql);
    require(*rest == '\0', "a fragment ends no statement");
    while (sqlite3_step(statement) == SQLITE_ROW) body(statement);
    if (sqlite3_finalize(statement) != SQLITE_OK)
      finding(std::string(sqlite3_errmsg(db_)) + " in " + sql);
  }

  sqlite3* db_ = nullptr;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  FuzzedDataProvider input(data, size);
  bool ofColumns = true;
  static const RedirectedFiles files;
  static OAUTHDBBasic store;  // of which only the translation is used
  const Json::Value record = anyDocument(input, ofColumns);
  Json::Value request;
  request["condition"] = record;
  request["modified"] = anyDocument(input, ofColumns);
  const std::string separator = input.ConsumeRandomLengthString(5);

  compared([&] { return store.ConcateParam(record, separator); },
           [&] { return pairs(record, separator); });
  const auto inserted =
      compared([&] { return store.GetInsertParam(record); }, [&] { return insertion(record); });
  const auto condition =
      compared([&] { return store.GetConditionParam(record); }, [&] { return where(record); });
  const auto update = compared(
      [&] { return store.GetUpdateParam(request); },
      [&] { return " SET " + pairs(request["modified"], ", ") + where(request["condition"]); });

  if (!ofColumns || !inserted || !update || !record.isObject() || record.empty() ||
      !request["modified"].isObject() || request["modified"].empty())
    return 0;
  static Scratch scratch;
  bool isCut = false;
  for (const std::string& sql : {"INSERT INTO t" + *inserted, "UPDATE t" + *update}) {
    if (sql.find('\0') == std::string::npos) continue;
    require(scratch.refuses(sql), "a NUL byte ends a statement inside its literal");
    isCut = true;
  }
  if (isCut) return 0;
  scratch.run("DELETE FROM t");
  scratch.run("INSERT INTO t" + *inserted);
  scratch.requireValues(record, false);
  bool anyNull = false;
  for (const Json::Value& value : record) anyNull = anyNull || value.isNull();
  require(scratch.count(*condition) == (anyNull ? 0 : 1), "a condition finds its own record");
  require(scratch.run("UPDATE t" + *update) == (anyNull ? 0 : 1),
          "an update changes what it finds");
  if (!anyNull) scratch.requireValues(request["modified"], true);
  return 0;
}
