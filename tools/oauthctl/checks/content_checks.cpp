#include "checks/content_checks.h"

#include <json/value.h>

#include <map>
#include <utility>

#include "decimal_text.h"
#include "oauth_db_basic.h"
#include "oauth_names.h"
#include "terminal/terminal.h"

namespace oauthctl {

namespace names = ZEVOOAUTHSERVER::names;
namespace column = names::column;
namespace table = names::table;

namespace {

// The texts that SQLite stores when the library makes its five tables, byte for byte, and the
// schema versions. They are written out a second time on purpose: values taken from the library
// would agree with any change to it.
const std::map<std::string, std::string> kDefinitions = {
    {"oauth_meta",
     "CREATE TABLE oauth_meta"
     "(tab_name text NOT NULL, version integer NOT NULL)"},
    {"oauth_clientInfo",
     "CREATE TABLE oauth_clientInfo"
     "(enable text NOT NULL, client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
     "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
     "id integer PRIMARY KEY)"},
    {"oauth_token",
     "CREATE TABLE oauth_token"
     "(username text NOT NULL,  client_id text NOT NULL,  scope text NOT NULL,  "
     "refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
     "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
     "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY)"},
    {"oauth_grantCode",
     "CREATE TABLE oauth_grantCode"
     "(username text NOT NULL, client_id text NOT NULL, scope text NOT NULL, "
     "code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT NULL, "
     "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY)"},
    {"oauth_log",
     "CREATE TABLE oauth_log"
     "(timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY)"},
};
const std::map<std::string, std::string> kVersions = {
    {"oauth_clientInfo", "2"}, {"oauth_grantCode", "2"}, {"oauth_token", "2"}};

constexpr char kRestore[] = "restore a backup";

// The first few row ids, as "rows 1, 2, 3 and 7 more".
std::string rowList(const std::vector<std::string>& ids) {
  constexpr std::size_t kNamed = 5;
  std::string text = ids.size() == 1 ? "row " : "rows ";
  for (std::size_t i = 0; i < ids.size() && i < kNamed; ++i) text += (i > 0 ? ", " : "") + ids[i];
  if (ids.size() > kNamed) text += " and " + std::to_string(ids.size() - kNamed) + " more";
  return text;
}

void checkPages(SqliteConnection& database, Findings& findings) {
  for (const SqliteConnection::Row& row : database.rows("PRAGMA integrity_check(20)"))
    if (row.front() != "ok") findings.push_back({"integrity check: " + row.front(), kRestore});
}

void checkDefinitions(SqliteConnection& database, Findings& findings) {
  std::map<std::string, std::string> missing = kDefinitions;
  for (const SqliteConnection::Row& row :
       database.rows("SELECT type, name, sql FROM sqlite_master ORDER BY rowid")) {
    const std::string &type = row[0], &name = row[1], &sql = row[2];
    const auto expected = kDefinitions.find(name);
    if (type == "table" && expected != kDefinitions.end()) {
      missing.erase(name);
      if (sql != expected->second)
        findings.push_back(
            {std::string("table ").append(name).append(" is defined differently: ") + sql,
             "find out who changed it, or restore a backup"});
    } else if (name.rfind("sqlite_", 0) != 0) {
      findings.push_back({std::string("unknown ").append(type).append(" ") + name,
                          "find out who made it, and drop it"});
    }
  }
  for (const auto& [name, sql] : missing)
    findings.push_back({"table " + name + " is missing",
                        "restore a backup, or run 'oauthctl status' to make an empty one"});
}

// The library writes these rows and never reads them, so it does not notice that one is missing.
void checkVersions(SqliteConnection& database, Findings& findings) {
  if (database.rows("SELECT 1 FROM sqlite_master WHERE name = 'oauth_meta'").empty()) return;
  std::map<std::string, int> seen;
  for (const SqliteConnection::Row& row :
       database.rows("SELECT tab_name, version FROM oauth_meta ORDER BY rowid")) {
    const auto expected = kVersions.find(row[0]);
    if (expected == kVersions.end())
      findings.push_back({"schema version of an unknown table " + row[0], "delete that row"});
    else if (row[1] != expected->second)
      findings.push_back(
          {"schema version of " + row[0] + " is " + row[1] + ", not " + expected->second,
           "use the program versions that belong to this database"});
    ++seen[row[0]];
  }
  for (const auto& [table, version] : kVersions)
    if (seen[table] != 1)
      findings.push_back(
          {"schema version of " + table + " stands there " + std::to_string(seen[table]) + " times",
           "leave one row for each table in oauth_meta, with version " + version});
}

// The library returns a value that it cannot decrypt as it is stored.
bool canDecrypt(std::string column, std::string stored) {
  Json::Value rows(Json::arrayValue);
  char* value = stored.data();
  char* columnName = column.data();
  ZEVOOAUTHSERVER::OAUTHDBBasic::TabGetCallback(&rows, 1, &value, &columnName);
  return rows.size() == 1 && rows[0U][column].asString() != stored;
}

// False if the table is missing, too: checkStructure() finds that.
bool hasColumn(SqliteConnection& database, const std::string& table, const std::string& column) {
  return !database
              .rows("SELECT 1 FROM pragma_table_info('" + table + "') WHERE name = '" + column +
                    "'")
              .empty();
}

void checkCipherColumn(SqliteConnection& database, const std::string& table,
                       const std::string& column, CipherCount& count, Findings& findings) {
  const std::vector<SqliteConnection::Row> rows =
      database.rows("SELECT id, " + column + " FROM " + table + " ORDER BY id");
  Progress progress("decrypting " + table + "." + column, rows.size());
  std::vector<std::string> unreadable;
  for (std::size_t i = 0; i < rows.size(); ++i) {
    if (!canDecrypt(column, rows[i][1])) unreadable.push_back(rows[i][0]);
    progress.update(i + 1);
  }
  count.values += static_cast<int>(rows.size());
  count.unreadable += static_cast<int>(unreadable.size());
  if (!unreadable.empty())
    findings.push_back({column + " in " + table + " does not decrypt: " + rowList(unreadable),
                        "bring back this machine's encryption key, or delete the rows"});
}

void checkExpiryColumn(SqliteConnection& database, const std::string& table,
                       const std::string& column, Findings& findings) {
  const std::vector<SqliteConnection::Row> rows =
      database.rows("SELECT id, " + column + " FROM " + table + " ORDER BY id");
  std::vector<std::string> wrong;
  for (const SqliteConnection::Row& row : rows)
    if (!ZEVOOAUTHSERVER::decimalNumber(row[1])) wrong.push_back(row[0]);
  if (!wrong.empty())
    findings.push_back({column + " in " + table + " is no number: " + rowList(wrong),
                        "the rows count as expired long ago; purge or revoke them"});
}

}  // namespace

Findings checkStructure(SqliteConnection& database) {
  Findings findings;
  checkPages(database, findings);
  checkDefinitions(database, findings);
  checkVersions(database, findings);
  return findings;
}

Findings checkJournalMode(SqliteConnection& database) {
  const std::string mode = database.value("PRAGMA journal_mode");
  if (mode == "delete") return {};
  return {
      {"journal mode is " + mode + ", not delete",
       "find out who changed it: 'PRAGMA journal_mode = delete' in sqlite3 while nothing runs"}};
}

Findings checkCiphers(SqliteConnection& database, CipherCount& count) {
  const std::pair<const char*, const char*> encryptedColumns[] = {
      {table::kClientInfo, column::kClientId},
      {table::kClientInfo, column::kClientSecret},
      {table::kGrantCode, column::kClientId},
      {table::kToken, column::kClientId}};
  Findings findings;
  for (const auto& [name, encrypted] : encryptedColumns)
    if (hasColumn(database, name, encrypted))
      checkCipherColumn(database, name, encrypted, count, findings);
  return findings;
}

Findings checkExpiries(SqliteConnection& database) {
  Findings findings;
  for (const char* const name : {table::kGrantCode, table::kToken})
    if (hasColumn(database, name, column::kExpiredTime))
      checkExpiryColumn(database, name, column::kExpiredTime, findings);
  return findings;
}

}  // namespace oauthctl
