#include "registry.h"

#include "exit_code.h"
#include "human_time.h"
#include "masking.h"
#include "oauth_utils.h"

namespace oauthctl {
namespace {

constexpr std::size_t kIdentifierLength = 64, kLongestNumber = 18;

bool isRowNumber(const std::string& text) {
  return !text.empty() && text.size() <= kLongestNumber &&
         text.find_first_not_of("0123456789") == std::string::npos;
}

}  // namespace

bool isClientIdentifier(const std::string& text) { return text.size() == kIdentifierLength; }

long long rowNumber(const std::string& text) {
  if (!isRowNumber(text))
    throw Failure(ExitCode::kUsage, "'" + text + "' is no row number: give one from the list");
  return *number(text);
}

Json::Value findClient(Database& database, const std::string& text) {
  Json::Value condition;
  if (isClientIdentifier(text))
    condition["client_id"] = getSQLFormatStr(text);
  else if (isRowNumber(text))
    condition["id"] = text;
  else
    throw Failure(ExitCode::kUsage,
                  "'" + text + "' names no client: give its number or its 64 characters");
  const Json::Value rows = database.rows(kClientTable, condition);
  if (rows.empty()) throw Failure(ExitCode::kAttention, "there is no client " + text);
  return rows[0U];
}

std::string clientIdentifier(Database& database, const std::string& text) {
  if (isClientIdentifier(text)) return text;
  return findClient(database, text)["client_id"].asString();
}

Registry::Registry(Database& database) {
  for (const Json::Value& row : database.rows(kClientTable))
    rows_[row["client_id"].asString()] = row;
}

const Json::Value& Registry::row(const std::string& identifier) const {
  const auto found = rows_.find(identifier);
  return found == rows_.end() ? Json::Value::nullSingleton() : found->second;
}

std::string Registry::describe(const std::string& identifier) const {
  const Json::Value& client = row(identifier);
  if (client.isNull()) return "not registered";
  return asGiven(client["display_name"].asString()) + " (" + client["id"].asString() +
         (client["enable"].asString() == "1" ? ")" : ", disabled)");
}

Json::Value clientDocument(const Json::Value& row, bool showSecrets) {
  Json::Value document;
  document["id"] = idValue(row);
  document["enabled"] = row["enable"].asString() == "1";
  document["client_id"] = row["client_id"];
  document["client_secret"] = masked(row["client_secret"].asString(), showSecrets);
  for (const char* const column : {"display_name", "redirect_uri", "scope"})
    document[column] = asGiven(row[column].asString());
  return document;
}

}  // namespace oauthctl
