// Authorization codes, and what is remembered with one.

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
  // What the code must be presented with: its redirect URI, of which the digest is kept, and for
  // PKCE (RFC 7636) the verifier of the challenge, which is "" if there is none.
  std::string redirectDigest, challenge;
};

// Issues a code; if the table is full, after the expired ones are gone.
std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& redirectUri,
                      const std::string& challenge);

// These two go through the store of the tokens. Each store is a connection, and a transaction spans
// one: only so do spending a code and issuing what it is spent for happen together, or not at all.

// Expired codes are found too.
std::optional<Code> findCode(TokenStore& tokens, const std::string& code);

// Whether the code was still there to be spent.
bool spend(TokenStore& tokens, const Code& code);

}  // namespace authserver
