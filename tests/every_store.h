// The stores as data, and the fixture of the rules that several of them share. What differs on
// purpose between the stores is in their descriptions, in every_store.cpp.

#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

// Plain values by column, without the id.
using Row = std::map<std::string, std::string>;

// The row with another value in one column.
Row with(Row row, const std::string& column, const std::string& value);

// A value that a change takes from its caller.
struct Field {
  std::string column;
  int min = 0, max = 0;  // bytes, both inclusive; a max of 0 means any length
  bool asGiven = false;  // stored without doubling its single quotes
};

// A form of Add() or Edit(), or a switch such as Disable().
struct Change {
  using Run = std::function<int(ZEVOOAUTHSERVER::OAUTHDBBasic& store, long long id, const Row& row,
                                Json::Value& result)>;

  std::string label;  // for the test's messages
  std::string trace;  // the name in its entry trace, "" if it has none
  Run run;
  std::vector<Field> fields;  // in the order in which it checks their lengths
  bool edits = true;          // a row that exists, or adds one
  Row sets = {};              // what a switch writes
};

struct Removal {
  std::vector<std::string> traces;  // the names in its entry traces
  std::function<int(ZEVOOAUTHSERVER::OAUTHDBBasic& store, long long id)> run;
};

// A look-up by a text of 64 bytes.
struct Lookup {
  std::string name;
  std::string column;
  std::function<int(ZEVOOAUTHSERVER::OAUTHDBBasic& store, const std::string& text,
                    Json::Value* rows)>
      run;
  bool asGiven = false;  // finds what is stored with the same single quotes
};

struct StoreDescription {
  using Store = ZEVOOAUTHSERVER::OAUTHDBBasic;

  std::string table;
  std::vector<std::string> columns;  // in the table's order, without the id
  Row row, other;                    // two rows of valid values that differ in every column
  std::string key;                   // the column whose values are unique
  std::vector<std::string> secrets;  // what Add() returns
  std::string ceiling;               // the setting
  std::string full;                  // the error text
  std::string lifetime;              // the setting; "" if no row expires
  bool reportsBadLengths = true;     // as an error of a change, or in the log alone
  bool opensTheAuditLog = false;     // at the start of Add()

  std::function<std::shared_ptr<Store>()> open;
  std::vector<Change> changes;  // the form of Add() that draws nothing at first
  std::vector<Removal> removals;
  std::vector<Lookup> lookups;  // the one by the key at first
  std::function<int(Store&, long long id, Json::Value* rows)> getById;
  std::function<int(Store&, Json::Value* rows)> getAll;
  std::function<int(Store&, const std::string& key)> getIndex;
  std::function<int(Store&)> purge;
};

extern const StoreDescription kClients, kCodes, kTokens, kAuditLog;

// The forms of Add() and Edit(), for tests that know their store.
int add(ZEVOOAUTHSERVER::OAUTHDBClientInfo& clients, const Row& row, Json::Value& result);
int addGenerated(ZEVOOAUTHSERVER::OAUTHDBClientInfo& clients, const Row& row, Json::Value& result);
int addWithSecret(ZEVOOAUTHSERVER::OAUTHDBClientInfo& clients, const Row& row, Json::Value& result);
int edit(ZEVOOAUTHSERVER::OAUTHDBClientInfo& clients, long long id, const Row& row);
int add(ZEVOOAUTHSERVER::OAUTHDBGrantCode& codes, const Row& row, Json::Value& result);
int issue(ZEVOOAUTHSERVER::OAUTHDBGrantCode& codes, const Row& row, Json::Value& result);
int shortEdit(ZEVOOAUTHSERVER::OAUTHDBGrantCode& codes, long long id, const Row& row);
int longEdit(ZEVOOAUTHSERVER::OAUTHDBGrantCode& codes, long long id, const Row& row);
int add(ZEVOOAUTHSERVER::OAUTHDBToken& tokens, const Row& row, Json::Value& result);
int issue(ZEVOOAUTHSERVER::OAUTHDBToken& tokens, const Row& row, Json::Value& result);
int shortEdit(ZEVOOAUTHSERVER::OAUTHDBToken& tokens, long long id, const Row& row);
int longEdit(ZEVOOAUTHSERVER::OAUTHDBToken& tokens, long long id, const Row& row);

template <class Store>
int add(Store& store, const Row& row) {
  Json::Value result;
  return add(store, row, result);
}

// Expiries as rows may hold them, and whether they are valid at 1700000000.
extern const std::map<std::string, bool> kExpiries;

// The fixture of one described store.
class RowStoreTest : public StoreTest {
 protected:
  using Store = ZEVOOAUTHSERVER::OAUTHDBBasic;

  explicit RowStoreTest(const StoreDescription& store) : its_(store) {}

  void createDatabase() const { its_.open(); }

  // The table, as query() prints it.
  Lines rows() const { return query("SELECT * FROM " + its_.table + " ORDER BY id"); }
  Lines ids() const { return query("SELECT id FROM " + its_.table + " ORDER BY id"); }
  std::string stored(const std::string& column) const {
    return query("SELECT " + column + " FROM " + its_.table).at(0);
  }
  int rowCount() const { return StoreTest::rowCount(its_.table); }
  std::string printed(const Row& row, const std::string& id = "1") const;

  void emptyTable() const { execute("DELETE FROM " + its_.table); }
  void dropTable() const { execute("DROP TABLE " + its_.table); }
  // Writes a row past the store, where no length rule holds.
  void insert(const std::string& id, const Row& row) const;
  // The same, with the id at the beginning of the key, so that keys differ. Returns the row.
  Row insertRow(const std::string& id) const;
  Row insertExpiring(const std::string& id, const std::string& expired_time) const;
  void refuseDeletes(const std::string& condition = "1") const;

  // What a look-up delivers.
  Json::Value document(const Row& row, const std::string& id) const;
  static Json::Value list(const std::vector<Json::Value>& rows);
  // What Add() returns of the row.
  Json::Value secretsOf(const Row& row) const;

  // Lines of the system log, from the store's own file and from the base class's.
  std::string own(const std::string& text) const { return "3 " + its_.table + ".cpp " + text; }
  static std::string base(const std::string& text) { return "3 oauth_db_basic.cpp " + text; }
  // "<operation> failed", with the error of its statement before it, if there was one.
  Lines failed(const std::string& operation) const;
  Lines failed(const std::string& operation, const std::string& error, int code) const;
  Lines unready(const std::string& operation) const;

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(Store&)>& body);
  // All traces of a look-up by text that finds this row.
  Lines traceOf(const Lookup& lookup, const Row& row, const std::string& id) const;

  const StoreDescription& its_;
};

// A value as a store keeps it that doubles single quotes.
std::string doubled(const std::string& value);
// Client identifiers and secrets are encrypted.
bool isSensitive(const std::string& column);
std::string sealedIf(const std::string& column, const std::string& value);
