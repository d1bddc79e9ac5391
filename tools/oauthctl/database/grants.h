// What codes and tokens have in common: both are given to a client for a user, and both expire.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "database/database.h"
#include "database/registry.h"

namespace oauthctl {

// How long after its expiry a purge spares a row, unless the operator gives another duration.
inline constexpr char kCodeGrace[] = "0", kTokenGrace[] = "30d";

struct Secret {
  const char* column;
  const char* heading;
};

struct GrantKind {
  const char* table;
  const char* singular;
  const char* plural;
  std::vector<Secret> secrets;
  const char* defaultGrace;
};
extern const GrantKind kCodes, kTokens;

// "1 token", "2 tokens"
std::string countText(long long count, const GrantKind& kind);

using RowTest = std::function<bool(const Json::Value& row)>;
RowTest belongsToClient(const std::string& identifier);
Json::Value rowsThatPass(const RowTest& test, const Json::Value& rows);

// Those of the client in one table.
int countOfClient(Database& database, const GrantKind& kind, const std::string& identifier);
int removeOfClient(Database& database, const GrantKind& kind, const std::string& identifier);

// Nothing if the stored expiry is not a number; for the library it has then expired.
std::optional<std::int64_t> expiryOf(const Json::Value& row);
bool isExpired(const Json::Value& row, std::int64_t now);
std::string expiryText(const Json::Value& row, std::int64_t now);

// The row as a document: numbers as numbers, secrets masked unless they are to be shown.
Json::Value grantDocument(const GrantKind& kind, const Json::Value& row, const Registry& registry,
                          bool showSecrets);

}  // namespace oauthctl
