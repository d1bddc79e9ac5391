// Access and refresh tokens.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "oauth_token.h"

namespace authserver {

// The store, which has opened or refuses the request.
class TokenStore : public ZEVOOAUTHSERVER::OAUTHDBToken {
 public:
  TokenStore();
};

// What tokens are issued for. A row holds an access token and its refresh token; a refresh may
// narrow the scope of the former, never that of the latter (RFC 6749, section 6).
struct Grant {
  std::string user, clientId;
  std::string accessScope, refreshScope;
  std::string codeDigest;  // of the code that it all began with
};

struct Token {
  long long id;
  Grant grant;
  std::int64_t expires;  // Unix seconds, concerns the access token
};

// Expired ones are found too.
std::optional<Token> findAccessToken(TokenStore& store, const std::string& token);
std::optional<Token> findRefreshToken(TokenStore& store, const std::string& token);

// Issues tokens and returns the document for the client (RFC 6749, section 5.1). Throws TableFull.
Json::Value issueTokens(TokenStore& store, const Grant& grant, const std::string& flow);

// Revokes what the client got for a code; returns how many rows that were.
int revokeIssuedFor(TokenStore& store, const std::string& codeDigest, const std::string& clientId);

// Deletes what expired so long ago that its refresh token will not be missed. Not the library's
// Purge(), which would end every login whose access token has expired.
void purgeLongExpired(TokenStore& store);

}  // namespace authserver
