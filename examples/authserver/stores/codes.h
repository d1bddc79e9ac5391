// Authorization codes, and what is stored with each.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tokens.h"

namespace authserver {

struct Code {
  long long id;
  std::string user, clientId, scope;
  std::int64_t expires;  // Unix seconds
  // Who presents the code must send the redirect URI with this digest and, unless the challenge of
  // PKCE (RFC 7636) is "", its verifier.
  std::string redirectDigest, challenge;
};

// Issues a code. Deletes the expired codes first if the table is full.
std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& redirectUri,
                      const std::string& challenge);

// The next two use the store of the tokens. Each store has its own connection, and a transaction
// belongs to one connection: this way one transaction spends a code and issues the tokens for it.

// Finds expired codes too.
std::optional<Code> findCode(TokenStore& tokens, const std::string& code);

// Deletes the code. False if another program has already deleted it.
bool spend(TokenStore& tokens, const Code& code);

}  // namespace authserver
