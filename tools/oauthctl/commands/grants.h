// What codes and tokens have in common: both are given to a client for a user, and both expire.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "database.h"
#include "invocation.h"
#include "registry.h"

namespace oauthctl {

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

using RowTest = std::function<bool(const Json::Value& row)>;

// The row as a document: numbers as numbers, secrets masked unless they are to be shown.
Json::Value grantDocument(const GrantKind& kind, const Json::Value& row, const Registry& registry,
                          bool showSecrets);

// Nothing if the stored expiry is no number; the library takes it for long past.
std::optional<std::int64_t> expiryOf(const Json::Value& row);
bool isExpired(const Json::Value& row, std::int64_t now);
std::string expiryText(const Json::Value& row, std::int64_t now);

// The commands that both have.
void listGrants(const GrantKind& kind, const Invocation& invocation);
void revokeGrants(const GrantKind& kind, const Invocation& invocation);
void purgeGrants(const GrantKind& kind, const Invocation& invocation);

// Those of the client, in one table, without asking.
int countOfClient(Database& database, const GrantKind& kind, const std::string& identifier);
int removeOfClient(Database& database, const GrantKind& kind, const std::string& identifier);

// "1 token", "2 tokens"
std::string counted(long long count, const GrantKind& kind);

}  // namespace oauthctl
