#include "database/registry.h"

#include "decimal_text.h"
#include "oauth_utils.h"
#include "terminal/escaping.h"
#include "terminal/exit_code.h"

namespace oauthctl {

namespace column = names::column;

namespace {

bool isRowNumber(const std::string& text) {
  constexpr std::size_t kLongest = 18;  // digits
  return !text.empty() && text.size() <= kLongest &&
         text.find_first_not_of("0123456789") == std::string::npos;
}

bool isClientIdentifier(const std::string& text) {
  return text.size() == static_cast<std::size_t>(names::limit::kClientId.max);
}

bool isEnabled(const Json::Value& row) { return row[column::kEnable].asString() == "1"; }

}  // namespace

long long rowNumber(const std::string& text) {
  if (!isRowNumber(text))
    throw Failure(ExitCode::kUsage, "'" + text + "' is no row number: give one from the list");
  return *ZEVOOAUTHSERVER::decimalNumber(text);
}

Json::Value findClient(Database& database, const std::string& text) {
  Json::Value condition;
  if (isClientIdentifier(text))
    condition[column::kClientId] = getSQLFormatStr(text);
  else if (isRowNumber(text))
    condition[column::kId] = text;
  else
    throw Failure(ExitCode::kUsage, "'" + text + "' names no client: give its number or its " +
                                        std::to_string(names::limit::kClientId.max) +
                                        " characters");
  const Json::Value rows = database.rows(names::table::kClientInfo, condition);
  if (rows.empty()) throw Failure(ExitCode::kAttention, "there is no client " + text);
  return rows[0U];
}

std::string clientIdentifier(Database& database, const std::string& text) {
  if (isClientIdentifier(text)) return text;
  return findClient(database, text)[column::kClientId].asString();
}

Registry::Registry(Database& database) {
  for (const Json::Value& row : database.rows(names::table::kClientInfo))
    rows_[row[column::kClientId].asString()] = row;
}

const Json::Value& Registry::row(const std::string& identifier) const {
  const auto found = rows_.find(identifier);
  return found == rows_.end() ? Json::Value::nullSingleton() : found->second;
}

std::string Registry::describe(const std::string& identifier) const {
  const Json::Value& client = row(identifier);
  if (client.isNull()) return "not registered";
  return originalText(client[column::kDisplayName].asString()) + " (" +
         client[column::kId].asString() + (isEnabled(client) ? ")" : ", disabled)");
}

Json::Value clientDocument(const Json::Value& row, bool showSecrets) {
  Json::Value document;
  document["id"] = idValue(row);
  document["enabled"] = isEnabled(row);
  document["client_id"] = row[column::kClientId];
  document["client_secret"] = masked(row[column::kClientSecret].asString(), showSecrets);
  for (const char* const name : {column::kDisplayName, column::kRedirectUri, column::kScope})
    document[name] = originalText(row[name].asString());
  return document;
}

}  // namespace oauthctl
