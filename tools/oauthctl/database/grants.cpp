#include "database/grants.h"

#include "decimal_text.h"
#include "terminal/escaping.h"
#include "terminal/human_time.h"
#include "unix_time.h"

namespace oauthctl {

namespace column = names::column;

const GrantKind kCodes = {
    names::table::kGrantCode, "code", "codes", {{column::kCode, "CODE"}}, kCodeGrace};
const GrantKind kTokens = {
    names::table::kToken,
    "token",
    "tokens",
    {{column::kAccessToken, "ACCESS TOKEN"}, {column::kRefreshToken, "REFRESH TOKEN"}},
    kTokenGrace};

std::string countText(long long count, const GrantKind& kind) {
  return std::to_string(count) + " " + (count == 1 ? kind.singular : kind.plural);
}

RowTest belongsToClient(const std::string& identifier) {
  return [identifier](const Json::Value& row) {
    return row[column::kClientId].asString() == identifier;
  };
}

Json::Value rowsThatPass(const RowTest& test, const Json::Value& rows) {
  Json::Value result(Json::arrayValue);
  for (const Json::Value& row : rows)
    if (test(row)) result.append(row);
  return result;
}

int countOfClient(Database& database, const GrantKind& kind, const std::string& identifier) {
  const Json::Value rows = database.rows(kind.table);
  return static_cast<int>(rowsThatPass(belongsToClient(identifier), rows).size());
}

int removeOfClient(Database& database, const GrantKind& kind, const std::string& identifier) {
  int removed = 0;
  const Json::Value rows = database.rows(kind.table);
  for (const Json::Value& row : rowsThatPass(belongsToClient(identifier), rows))
    removed += database.remove(kind.table, idForChange(row)) ? 1 : 0;
  return removed;
}

std::optional<std::int64_t> expiryOf(const Json::Value& row) {
  return ZEVOOAUTHSERVER::decimalNumber(row[column::kExpiredTime].asString());
}

bool isExpired(const Json::Value& row, std::int64_t now) { return now > expiryOf(row).value_or(0); }

std::string expiryText(const Json::Value& row, std::int64_t now) {
  const std::optional<std::int64_t> expiry = expiryOf(row);
  return expiry ? relativeTime(*expiry, now)
                : "no number: '" + row[column::kExpiredTime].asString() + "'";
}

Json::Value grantDocument(const GrantKind& kind, const Json::Value& row, const Registry& registry,
                          bool showSecrets) {
  Json::Value document;
  document["id"] = idValue(row);
  for (const char* const name :
       {column::kUserName, column::kScope, column::kState, column::kFlowType})
    if (row.isMember(name)) document[name] = originalText(row[name].asString());
  document["ip"] = row[column::kIp];
  document["client_id"] = row[column::kClientId];
  const Json::Value& client = registry.row(row[column::kClientId].asString());
  document["client"] = client.isNull() ? Json::Value() : idValue(client);
  const std::optional<std::int64_t> expiry = expiryOf(row);
  document["expired_time"] =
      expiry ? Json::Value(static_cast<Json::Int64>(*expiry)) : Json::Value();
  document["expired"] = isExpired(row, ZEVOOAUTHSERVER::unixNow());
  for (const auto& [name, heading] : kind.secrets)
    document[name] = masked(row[name].asString(), showSecrets);
  return document;
}

}  // namespace oauthctl
