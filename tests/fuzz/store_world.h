// The surroundings of one store: the database in memory, its clock, and a model of the rows that it
// must hold.

#pragma once

#include <json/value.h>

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>

#include "fake_clock.h"
#include "fake_host.h"
#include "fuzz_input.h"
#include "oauth_db_basic.h"
#include "redirected_files.h"
#include "rules.h"

using Row = std::map<std::string, std::string>;  // stored text by column, "id" among them
using Rows = std::map<std::int64_t, Row>;        // by id

// What a change writes, by column. Single quotes are doubled or not; client identifiers and secrets
// are encrypted in any case.
struct Values {
  Row quoted, asGiven;
};

class StoreWorld {
 public:
  // The values of the settings file. They are small, so that short inputs can fill a table.
  static constexpr std::size_t kRowMax = 5, kLogMax = 4;
  static constexpr int kPeriod = 60;  // seconds

  // Starts with the same rows in every table each time; diagnostics are all on.
  explicit StoreWorld(FuzzedDataProvider& input);
  StoreWorld(const StoreWorld&) = delete;
  StoreWorld& operator=(const StoreWorld&) = delete;

  // The model. Change it, then let expect() compare.
  Rows& rows(const std::string& table) { return tables_[table]; }
  // Inserts a row with the next id, or updates the row of the id, and returns what the store must
  // answer.
  int insert(const std::string& table, const std::string& unique, const Values& values);
  int update(const std::string& table, std::int64_t id, const Values& values);
  void addToLog(const std::string& msg);
  void dropExpired(const std::string& table);

  // Sets the error that the store must report from now on. Returns 0, the result of a failure.
  int fail(int code, const std::string& msg);
  // Compares the result, the store's error state and every table with the model.
  void expect(const ZEVOOAUTHSERVER::OAUTHDBBasic& store, int result, int expected) const;
  // Compares the delivered rows with those of the model for which wanted(row) is true.
  template <class Wanted>
  void expectRows(const std::string& table, const Json::Value& delivered, Wanted wanted) {
    Json::Value expected(Json::arrayValue);
    for (const auto& [id, row] : rows(table))
      if (wanted(row)) expected.append(plain(row));
    requireEqual(delivered, expected);
  }
  static void requireEqual(const Json::Value& actual, const Json::Value& expected);
  // Requires a look-up by a text of 64 bytes to have found the rows that hold it. Returns the id of
  // the last one, 0 if there is none.
  std::int64_t expectFound(const ZEVOOAUTHSERVER::OAUTHDBBasic& store, const std::string& table,
                           const Json::Value& delivered, int success, const std::string& column,
                           const std::string& text, bool asGiven = false);
  // Reads any row by its id, or every row.
  template <class Store>
  void getById(Store& store, const std::string& table) {
    const std::int64_t id = anyId(table);
    Json::Value delivered;
    expect(store, store.Get(id, &delivered), 1);
    expectRows(table, delivered, [&](const Row& row) { return number(row.at("id")) == id; });
  }
  template <class Store>
  void getAll(Store& store, const std::string& table) {
    Json::Value delivered;
    expect(store, store.Get(&delivered), 1);
    expectRows(table, delivered, [](const Row&) { return true; });
  }

  // The id of a row of the table, or any number.
  std::int64_t anyId(const std::string& table);
  // Moves the library's clock, or the database's.
  void moveClock();
  std::int64_t now() const { return clock_.now(); }
  // The lines of the audit log that are LIKE the pattern, which is given as a parameter.
  static Json::Value linesLike(const std::string& pattern, const std::string& option);

 private:
  void add(const std::string& table, Row row);  // the id is the next one
  bool refused(const Row& asGiven);
  static Json::Value plain(const Row& row);
  static void expectTable(const std::string& table, const Rows& rows);

  FuzzedDataProvider& input_;
  RedirectedFiles files_;
  FakeClock clock_;
  FakeHost host_;
  std::map<std::string, Rows> tables_;
  int code_ = ZEVOOAUTHSERVER::kErrNone;
  std::string msg_;
};

// The body of a fuzz target: runs some steps of the class with the input.
template <class Fuzz>
int run(const std::uint8_t* data, std::size_t size) {
  FuzzedDataProvider input(data, size);
  Fuzz fuzz(input);
  for (int i = 0; i < 8 && input.remaining_bytes() > 0; ++i) fuzz.step();
  return 0;
}
