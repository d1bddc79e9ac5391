// The commands that codes and tokens have in common.

#include <algorithm>

#include "commands/commands.h"
#include "database/grants.h"
#include "oauth_utils.h"
#include "terminal/exit_code.h"
#include "terminal/human_time.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"
#include "unix_time.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::unixNow;

namespace column = names::column;

namespace {

constexpr char kConditionOptions[][9] = {"--user", "--client", "--id"};

bool hasCondition(const Invocation& invocation) {
  return std::any_of(std::begin(kConditionOptions), std::end(kConditionOptions),
                     [&](const char* name) { return invocation.has(name); });
}

RowTest hasId(long long id) {
  return [id](const Json::Value& row) { return idOf(row) == id; };
}

// The name is stored with its quotes doubled or, after some edits, as it is.
RowTest isOfUser(const std::string& user) {
  return [user, quoted = getSQLFormatStr(user)](const Json::Value& row) {
    const std::string stored = row[column::kUserName].asString();
    return stored == user || stored == quoted;
  };
}

// Tests a row against all conditions that the operator gave.
RowTest conditionTest(Database& database, const Invocation& invocation) {
  std::vector<RowTest> tests;
  if (invocation.has("--id")) tests.push_back(hasId(rowNumber(invocation.value("--id"))));
  if (invocation.has("--user")) tests.push_back(isOfUser(invocation.value("--user")));
  if (invocation.has("--client"))
    tests.push_back(belongsToClient(clientIdentifier(database, invocation.value("--client"))));
  return [tests](const Json::Value& row) {
    return std::all_of(tests.begin(), tests.end(), [&](const RowTest& t) { return t(row); });
  };
}

std::string conditionText(const Invocation& invocation) {
  std::string text;
  for (const auto* const name : kConditionOptions)
    if (invocation.has(name)) text += std::string(" ") + name + " " + invocation.value(name);
  return text;
}

[[noreturn]] void throwNone(const GrantKind& kind, const Invocation& invocation) {
  throw Failure(ExitCode::kAttention,
                std::string("there is no ") + kind.singular + " with" + conditionText(invocation));
}

struct Removal {
  int removed = 0, left = 0;  // rows
};

// Deletes the rows that pass the test under the write lock. There may be more of them than were
// counted before.
Removal removeRows(Database& database, const GrantKind& kind, const RowTest& test) {
  Removal removal;
  database.inTransaction([&] {
    const Json::Value rows = rowsThatPass(test, database.rows(kind.table));
    Progress progress(std::string("deleting ") + kind.plural, rows.size());
    for (const Json::Value& row : rows) {
      removal.removed += database.remove(kind.table, idForChange(row)) ? 1 : 0;
      progress.update(static_cast<std::size_t>(removal.removed));
    }
    removal.left = database.rowCount(kind.table);
  });
  return removal;
}

// "token 2 of alice for Photo album (1)"
std::string describe(const GrantKind& kind, const Json::Value& row, const Registry& registry) {
  return std::string(kind.singular) + " " + row[column::kId].asString() + " of " +
         originalText(row[column::kUserName].asString()) + " for " +
         registry.describe(row[column::kClientId].asString());
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
    std::vector<std::string> cells = {row[column::kId].asString(),
                                      originalText(row[column::kUserName].asString()),
                                      registry.describe(row[column::kClientId].asString()),
                                      originalText(row[column::kScope].asString()),
                                      row[column::kIp].asString(),
                                      expiryText(row, now)};
    if (showSecrets)
      for (const Secret& secret : kind.secrets) cells.push_back(row[secret.column].asString());
    table.add(cells, isExpired(row, now) ? Tone::kFaint : Tone::kPlain);
  }
  table.print();
}

void listGrants(const GrantKind& kind, const Invocation& invocation) {
  Database database(Access::kRead);
  const RowTest test = conditionTest(database, invocation);
  const Json::Value rows = rowsThatPass(test, database.rows(kind.table));
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
  if (hasCondition(invocation)) throwNone(kind, invocation);
  if (!invocation.has("--json")) say(std::string("no ") + kind.plural);
}

// A number is given again once its row is deleted. So the row must still be the one that was shown.
void revokeShown(Database& database, const GrantKind& kind, const Invocation& invocation,
                 const Json::Value& shown) {
  const std::string description = describe(kind, shown, Registry(database));
  confirm(invocation, "Delete " + description + "?");
  const auto isShown = [&](const Json::Value& row) { return row == shown; };
  if (removeRows(database, kind, isShown).removed == 0) throwChangedMeanwhile(description);
  say("deleted " + countText(1, kind));
}

void revokeGrants(const GrantKind& kind, const Invocation& invocation) {
  Database database(Access::kWrite);
  const RowTest test = conditionTest(database, invocation);
  const Json::Value rows = rowsThatPass(test, database.rows(kind.table));
  if (rows.empty()) throwNone(kind, invocation);
  if (invocation.has("--id")) {
    revokeShown(database, kind, invocation, rows[0U]);
    return;
  }
  confirm(invocation,
          "Delete " + countText(rows.size(), kind) + " with" + conditionText(invocation) + "?");
  const int removed = removeRows(database, kind, test).removed;
  if (removed == 0) throwNone(kind, invocation);
  say("deleted " + countText(removed, kind));
}

// How long after its expiry a row is spared, in seconds.
std::int64_t graceOf(const GrantKind& kind, const Invocation& invocation) {
  const std::string text =
      invocation.has("--grace") ? invocation.value("--grace") : kind.defaultGrace;
  const std::optional<std::int64_t> grace = duration(text);
  if (!grace)
    throw Failure(ExitCode::kUsage,
                  "'" + text + "' is no duration: give 90s, 45m, 12h, 30d, 2w or 0");
  return *grace;
}

void purgeGrants(const GrantKind& kind, const Invocation& invocation) {
  const std::int64_t grace = graceOf(kind, invocation);
  const bool dryRun = invocation.has("--dry-run");
  Database database(dryRun ? Access::kRead : Access::kWrite);
  const std::int64_t latest = unixNow() - grace;
  const RowTest test = [latest](const Json::Value& row) { return isExpired(row, latest); };
  const Json::Value all = database.rows(kind.table), expired = rowsThatPass(test, all);
  const std::string what = countText(expired.size(), kind) + " of " + std::to_string(all.size()) +
                           ", expired" +
                           (grace == 0 ? "" : " more than " + lengthOfTime(grace) + " ago");
  if (expired.empty() || dryRun) {
    say((dryRun ? "would delete " : "nothing to delete: ") + what);
    return;
  }
  confirm(invocation, "Delete " + what + "?");
  const Removal removal = removeRows(database, kind, test);
  say("deleted " + countText(removal.removed, kind) + ", " + std::to_string(removal.left) +
      " left");
}

}  // namespace

void listCodes(const Invocation& invocation) { listGrants(kCodes, invocation); }
void listTokens(const Invocation& invocation) { listGrants(kTokens, invocation); }

// Deletes the rows. The library's own revocation only makes a code expire, from the next second on.
void revokeCodes(const Invocation& invocation) { revokeGrants(kCodes, invocation); }
void revokeTokens(const Invocation& invocation) { revokeGrants(kTokens, invocation); }

void purgeCodes(const Invocation& invocation) { purgeGrants(kCodes, invocation); }
void purgeTokens(const Invocation& invocation) { purgeGrants(kTokens, invocation); }

}  // namespace oauthctl
