// The registered clients, as the other commands need them.

#pragma once

#include <json/value.h>

#include <map>
#include <string>

#include "database/database.h"

namespace oauthctl {

// The row of a client; throws if there is none. The operator gives its row number, of 1 to 18
// digits, or its identifier, which is longer: no text can be both.
Json::Value findClient(Database& database, const std::string& text);

// The identifier for a condition on codes or tokens. An identifier need not be registered: codes
// and tokens may outlive their client.
std::string clientIdentifier(Database& database, const std::string& text);

// Rows by identifier.
class Registry {
 public:
  explicit Registry(Database& database);

  // "Photo album (3)", "Photo album (3, disabled)" or "not registered"
  std::string describe(const std::string& identifier) const;
  // Null if it is not registered.
  const Json::Value& row(const std::string& identifier) const;

 private:
  std::map<std::string, Json::Value> rows_;
};

// The row as a document: numbers as numbers, the secret masked unless it is to be shown.
Json::Value clientDocument(const Json::Value& row, bool showSecrets);

// A row number that the operator gave, as in "token show N".
long long rowNumber(const std::string& text);

}  // namespace oauthctl
