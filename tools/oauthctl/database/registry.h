// The registered clients, as the other commands ask for them.

#pragma once

#include <json/value.h>

#include <map>
#include <string>

#include "database.h"

namespace oauthctl {

// An operator names a client by its row number, 1 to 18 digits, or by its identifier, 64
// characters: no text can be both.
bool isClientIdentifier(const std::string& text);

// The client's row; throws if there is none or the text names none.
Json::Value findClient(Database& database, const std::string& text);

// The identifier for a condition on codes or tokens. One of 64 characters need not be registered:
// codes and tokens survive their client.
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

// A number that the operator gave, as in "token show N".
long long rowNumber(const std::string& text);

}  // namespace oauthctl
