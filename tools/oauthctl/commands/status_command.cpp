#include <sys/stat.h>

#include <algorithm>
#include <vector>

#include "checks/settings_report.h"
#include "commands/commands.h"
#include "database/fixed_paths.h"
#include "database/grants.h"
#include "oauth_utils.h"
#include "terminal/exit_code.h"
#include "terminal/human_time.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"
#include "unix_time.h"

namespace oauthctl {

namespace setting = names::setting;
namespace table = names::table;

namespace {

struct TableFacts {
  const char* name;
  const char* setting;  // of its ceiling
  bool trimsItself = false;
  const char* table;
  int rows = 0, ceiling = 0, expired = 0;
  bool expires = false;
  std::optional<std::int64_t> earliest = std::nullopt, latest = std::nullopt;

  int usedPercent() const { return static_cast<int>(100LL * rows / ceiling); }
  bool needsAttention() const { return !trimsItself && usedPercent() >= kWarnFrom; }
};

void readExpiries(Database& database, TableFacts& facts, std::int64_t now) {
  const Json::Value rows = database.rows(facts.table);
  facts.rows = static_cast<int>(rows.size());
  for (const Json::Value& row : rows) {
    facts.expired += isExpired(row, now) ? 1 : 0;
    const std::optional<std::int64_t> expiry = expiryOf(row);
    if (!expiry) continue;
    facts.earliest = std::min(facts.earliest.value_or(*expiry), *expiry);
    facts.latest = std::max(facts.latest.value_or(*expiry), *expiry);
  }
}

std::vector<TableFacts> readTables(Database& database, std::int64_t now) {
  std::vector<TableFacts> tables = {{"clients", setting::kClientInfoMax, false, table::kClientInfo},
                                    {"codes", setting::kGrantCodeMax, false, table::kGrantCode},
                                    {"tokens", setting::kTokenMax, false, table::kToken},
                                    {"log", setting::kLogMax, true, table::kLog}};
  for (TableFacts& facts : tables) {
    facts.ceiling = getTableRowMax(facts.setting);
    facts.expires = facts.table == table::kGrantCode || facts.table == table::kToken;
    if (facts.expires)
      readExpiries(database, facts, now);
    else
      facts.rows = database.rowCount(facts.table);
  }
  return tables;
}

std::vector<std::string> warningsAbout(const std::vector<TableFacts>& tables) {
  std::vector<std::string> warnings;
  for (const TableFacts& facts : tables) {
    if (!facts.needsAttention()) continue;
    std::string text = std::string(facts.name) + " are " + std::to_string(facts.usedPercent()) +
                       " % full, " + std::to_string(facts.rows) + " of " +
                       std::to_string(facts.ceiling);
    if (facts.expires)
      text += ", expired ones count (" + std::to_string(facts.expired) + "): purge them";
    warnings.push_back(text + " or raise " + facts.setting);
  }
  return warnings;
}

void printTables(const std::vector<TableFacts>& tables, std::int64_t now) {
  Table table({{"TABLE"},
               {"ROWS", true},
               {"CEILING", true},
               {"USED", true},
               {"EXPIRED", true},
               {"SOONEST EXPIRY"},
               {"LATEST EXPIRY"}});
  const auto when = [now](const std::optional<std::int64_t>& moment) {
    return moment ? relativeTime(*moment, now) : std::string();
  };
  for (const TableFacts& facts : tables)
    table.add({facts.name, std::to_string(facts.rows), std::to_string(facts.ceiling),
               std::to_string(facts.usedPercent()) + " %",
               facts.expires ? std::to_string(facts.expired) : "", when(facts.earliest),
               when(facts.latest)},
              facts.needsAttention() ? Tone::kWarning : Tone::kPlain);
  table.print();
}

void printSettings(const SettingsReport& report) {
  if (!report.problem.empty()) say(fixed_paths::settings() + " " + report.problem);
  Table table({{"SETTING"}, {"VALUE", true}, {"WHERE FROM"}});
  for (const SettingInForce& setting : report.settings)
    table.add({setting.name, std::to_string(setting.value), setting.origin},
              setting.isIgnored ? Tone::kWarning : Tone::kPlain);
  table.print();
}

Json::Value tableDocuments(const std::vector<TableFacts>& tables) {
  Json::Value documents(Json::arrayValue);
  const auto moment = [](const std::optional<std::int64_t>& value) {
    return value ? Json::Value(static_cast<Json::Int64>(*value)) : Json::Value();
  };
  for (const TableFacts& facts : tables) {
    Json::Value document;
    document["table"] = facts.name;
    document["rows"] = facts.rows;
    document["ceiling"] = facts.ceiling;
    document["used_percent"] = facts.usedPercent();
    document["needs_attention"] = facts.needsAttention();
    if (facts.expires) {
      document["expired"] = facts.expired;
      document["soonest_expiry"] = moment(facts.earliest);
      document["latest_expiry"] = moment(facts.latest);
    }
    documents.append(document);
  }
  return documents;
}

Json::Value settingsDocument(const SettingsReport& report) {
  Json::Value document;
  document["file"] = fixed_paths::settings();
  document["problem"] = report.problem.empty() ? Json::Value() : Json::Value(report.problem);
  for (const SettingInForce& setting : report.settings) {
    document["values"][setting.name]["value"] = setting.value;
    document["values"][setting.name]["from"] = setting.origin;
  }
  return document;
}

struct FileFacts {
  std::string path;
  long long bytes;
  Json::Value versions;  // rows of the meta table
};

FileFacts readFile(Database& database) {
  FileFacts facts = {fixed_paths::database(), 0, database.rows(table::kMeta)};
  struct stat status;
  if (stat(facts.path.c_str(), &status) == 0) facts.bytes = status.st_size;
  return facts;
}

void printFile(const FileFacts& facts) {
  std::string versions;
  for (const Json::Value& row : facts.versions)
    versions += (versions.empty() ? "" : ", ") + row["tab_name"].asString() + " " +
                row["version"].asString();
  printPairs({{"file", facts.path},
              {"size", std::to_string(facts.bytes) + " bytes"},
              {"schema versions", versions}});
}

Json::Value fileDocument(const FileFacts& facts) {
  Json::Value document;
  document["path"] = facts.path;
  document["bytes"] = static_cast<Json::Int64>(facts.bytes);
  document["schema_versions"] = Json::objectValue;
  for (const Json::Value& row : facts.versions)
    document["schema_versions"][row["tab_name"].asString()] = row["version"];
  return document;
}

Json::Value stringArray(const std::vector<std::string>& texts) {
  Json::Value array(Json::arrayValue);
  for (const std::string& text : texts) array.append(text);
  return array;
}

}  // namespace

void showStatus(const Invocation& invocation) {
  const std::int64_t now = ZEVOOAUTHSERVER::unixNow();
  Database database(Access::kRead);
  const std::vector<TableFacts> tables = readTables(database, now);
  const FileFacts file = readFile(database);
  const SettingsReport settings = readSettings();
  const std::vector<std::string> warnings = warningsAbout(tables);
  if (invocation.has("--json")) {
    Json::Value document;
    document["database"] = fileDocument(file);
    document["tables"] = tableDocuments(tables);
    document["settings"] = settingsDocument(settings);
    document["warnings"] = stringArray(warnings);
    printJson(document);
  } else {
    printTables(tables, now);
    say("");
    printSettings(settings);
    say("");
    printFile(file);
  }
  if (warnings.empty()) return;
  std::string line;
  for (const std::string& warning : warnings) line += (line.empty() ? "" : "; ") + warning;
  throw Failure(ExitCode::kAttention, line);
}

}  // namespace oauthctl
