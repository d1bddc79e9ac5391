#include "grants.h"

#include <algorithm>

#include "exit_code.h"
#include "human_time.h"
#include "masking.h"
#include "oauth_utils.h"
#include "table_output.h"
#include "terminal.h"

namespace oauthctl {
namespace {

constexpr char kAllConditions[][9] = {"--user", "--client", "--id"};

bool isConditional(const Invocation& invocation) {
  return std::any_of(std::begin(kAllConditions), std::end(kAllConditions),
                     [&](const char* name) { return invocation.has(name); });
}

// The rows that the operator's conditions name.
RowTest selection(Database& database, const Invocation& invocation) {
  std::vector<RowTest> tests;
  if (invocation.has("--id")) {
    const long long id = rowNumber(invocation.value("--id"));
    tests.emplace_back([id](const Json::Value& row) { return idOf(row) == id; });
  }
  if (invocation.has("--user")) {
    // Stored with its quotes doubled or, after some edits, as it is.
    const std::string user = invocation.value("--user"), quoted = getSQLFormatStr(user);
    tests.emplace_back([user, quoted](const Json::Value& row) {
      const std::string stored = row["username"].asString();
      return stored == user || stored == quoted;
    });
  }
  if (invocation.has("--client")) {
    const std::string identifier = clientIdentifier(database, invocation.value("--client"));
    tests.emplace_back(
        [identifier](const Json::Value& row) { return row["client_id"].asString() == identifier; });
  }
  return [tests](const Json::Value& row) {
    return std::all_of(tests.begin(), tests.end(), [&](const RowTest& t) { return t(row); });
  };
}

Json::Value matching(const Json::Value& rows, const RowTest& test) {
  Json::Value result(Json::arrayValue);
  for (const Json::Value& row : rows)
    if (test(row)) result.append(row);
  return result;
}

// Deletes what meets the test at the moment of writing, which may be more than was counted before.
int removeMatching(Database& database, const GrantKind& kind, const RowTest& test) {
  int removed = 0;
  database.inTransaction([&] {
    const Json::Value doomed = matching(database.rows(kind.table), test);
    Progress progress(std::string("deleting ") + kind.plural, doomed.size());
    for (const Json::Value& row : doomed) {
      removed += database.remove(kind.table, idForChange(row)) ? 1 : 0;
      progress.update(static_cast<std::size_t>(removed));
    }
  });
  return removed;
}

RowTest ofClient(const std::string& identifier) {
  return [identifier](const Json::Value& row) { return row["client_id"].asString() == identifier; };
}

std::string conditionText(const Invocation& invocation) {
  std::string text;
  for (const auto* const name : kAllConditions)
    if (invocation.has(name)) text += std::string(" ") + name + " " + invocation.value(name);
  return text;
}

[[noreturn]] void throwNone(const GrantKind& kind, const Invocation& invocation) {
  throw Failure(ExitCode::kAttention,
                std::string("there is no ") + kind.singular + " with" + conditionText(invocation));
}

void printGrants(const GrantKind& kind, const Json::Value& rows, const Registry& registry,
                 bool showSecrets) {
  std::vector<Column> columns = {{"ID", true}, {"USER"}, {"CLIENT"},
                                 {"SCOPE"},    {"IP"},   {"EXPIRES"}};
  if (showSecrets)
    for (const Secret& secret : kind.secrets) columns.push_back({secret.heading});
  Table table(columns);
  const std::int64_t now = unixNow();
  for (const Json::Value& row : rows) {
    std::vector<std::string> cells = {row["id"].asString(),
                                      asGiven(row["username"].asString()),
                                      registry.describe(row["client_id"].asString()),
                                      asGiven(row["scope"].asString()),
                                      row["ip"].asString(),
                                      expiryText(row, now)};
    if (showSecrets)
      for (const Secret& secret : kind.secrets) cells.push_back(row[secret.column].asString());
    table.add(cells, isExpired(row, now) ? Tone::kFaint : Tone::kPlain);
  }
  table.print();
}

}  // namespace

const GrantKind kCodes = {kCodeTable, "code", "codes", {{"code", "CODE"}}, "0"};
const GrantKind kTokens = {kTokenTable,
                           "token",
                           "tokens",
                           {{"access_token", "ACCESS TOKEN"}, {"refresh_token", "REFRESH TOKEN"}},
                           "30d"};

std::string counted(long long count, const GrantKind& kind) {
  return std::to_string(count) + " " + (count == 1 ? kind.singular : kind.plural);
}

std::optional<std::int64_t> expiryOf(const Json::Value& row) {
  return number(row["expired_time"].asString());
}

bool isExpired(const Json::Value& row, std::int64_t now) { return now > expiryOf(row).value_or(0); }

std::string expiryText(const Json::Value& row, std::int64_t now) {
  const std::optional<std::int64_t> expiry = expiryOf(row);
  return expiry ? relativeTime(*expiry, now)
                : "no number: '" + row["expired_time"].asString() + "'";
}

Json::Value grantDocument(const GrantKind& kind, const Json::Value& row, const Registry& registry,
                          bool showSecrets) {
  Json::Value document;
  document["id"] = idValue(row);
  for (const char* const column : {"username", "scope", "state", "flow_type"})
    if (row.isMember(column)) document[column] = asGiven(row[column].asString());
  document["ip"] = row["ip"];
  document["client_id"] = row["client_id"];
  const Json::Value& client = registry.row(row["client_id"].asString());
  document["client"] = Json::nullValue;
  if (!client.isNull()) document["client"] = clientDocument(client, false)["id"];
  const std::optional<std::int64_t> expiry = expiryOf(row);
  document["expired_time"] = Json::nullValue;
  if (expiry) document["expired_time"] = static_cast<Json::Int64>(*expiry);
  document["expired"] = isExpired(row, unixNow());
  for (const auto& [column, heading] : kind.secrets)
    document[column] = masked(row[column].asString(), showSecrets);
  return document;
}

void listGrants(const GrantKind& kind, const Invocation& invocation) {
  Database database(Access::kRead);
  const RowTest test = selection(database, invocation);
  const Json::Value rows = matching(database.rows(kind.table), test);
  const Registry registry(database);
  const bool showSecrets = invocation.has("--show-secrets");
  if (invocation.has("--json")) {
    Json::Value documents(Json::arrayValue);
    for (const Json::Value& row : rows)
      documents.append(grantDocument(kind, row, registry, showSecrets));
    printJson(documents);
  } else {
    printGrants(kind, rows, registry, showSecrets);
  }
  if (!rows.empty()) return;
  if (isConditional(invocation)) throwNone(kind, invocation);
  if (!invocation.has("--json")) say(std::string("no ") + kind.plural);
}

void revokeGrants(const GrantKind& kind, const Invocation& invocation) {
  Database database(Access::kWrite);
  const RowTest test = selection(database, invocation);
  const Json::Value doomed = matching(database.rows(kind.table), test);
  if (doomed.empty()) throwNone(kind, invocation);
  confirm(invocation,
          "Delete " + counted(doomed.size(), kind) + " with" + conditionText(invocation) + "?");
  const int removed = removeMatching(database, kind, test);
  if (removed == 0) throwNone(kind, invocation);
  say("deleted " + counted(removed, kind));
}

void purgeGrants(const GrantKind& kind, const Invocation& invocation) {
  const std::string text =
      invocation.has("--grace") ? invocation.value("--grace") : kind.defaultGrace;
  const std::optional<std::int64_t> grace = duration(text);
  if (!grace)
    throw Failure(ExitCode::kUsage,
                  "'" + text + "' is no duration: give 90s, 45m, 12h, 30d, 2w or 0");
  const bool dryRun = invocation.has("--dry-run");
  Database database(dryRun ? Access::kRead : Access::kWrite);
  const std::int64_t limit = unixNow() - *grace;
  const RowTest test = [limit](const Json::Value& row) { return isExpired(row, limit); };
  const Json::Value rows = database.rows(kind.table);
  const Json::Value doomed = matching(rows, test);
  const std::string what = counted(doomed.size(), kind) + " of " + std::to_string(rows.size()) +
                           ", expired" +
                           (*grace == 0 ? "" : " more than " + lengthOfTime(*grace) + " ago");
  if (doomed.empty() || dryRun) {
    say((dryRun ? "would delete " : "nothing to delete: ") + what);
    return;
  }
  confirm(invocation, "Delete " + what + "?");
  const int removed = removeMatching(database, kind, test);
  say("deleted " + counted(removed, kind) + ", " + std::to_string(database.rowCount(kind.table)) +
      " left");
}

int countOfClient(Database& database, const GrantKind& kind, const std::string& identifier) {
  return static_cast<int>(matching(database.rows(kind.table), ofClient(identifier)).size());
}

int removeOfClient(Database& database, const GrantKind& kind, const std::string& identifier) {
  int removed = 0;
  for (const Json::Value& row : matching(database.rows(kind.table), ofClient(identifier)))
    removed += database.remove(kind.table, idForChange(row)) ? 1 : 0;
  return removed;
}

}  // namespace oauthctl
