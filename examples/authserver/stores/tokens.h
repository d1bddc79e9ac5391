// Access and refresh tokens.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "oauth_token.h"

namespace authserver {

// The store. Its constructor refuses the request if the store does not open.
class TokenStore : public ZEVOOAUTHSERVER::OAUTHDBToken {
 public:
  TokenStore();
};

// What tokens are issued for. A row holds an access token and its refresh token. A refresh may
// narrow the scope of the access token, but never that of the refresh token (RFC 6749, section 6).
struct Grant {
  std::string user, clientId;
  std::string accessScope, refreshScope;
  std::string codeDigest;  // of the code that the first tokens were issued for
};

struct Token {
  long long id;
  Grant grant;
  std::int64_t expires;  // Unix seconds; a refresh token does not expire
};

// Both find expired tokens too.
std::optional<Token> findAccessToken(TokenStore& store, const std::string& token);
std::optional<Token> findRefreshToken(TokenStore& store, const std::string& token);

// Issues tokens and returns the document for the client (RFC 6749, section 5.1). Throws TableFull.
Json::Value issueTokens(TokenStore& store, const Grant& grant, const std::string& flow);

// Revokes the tokens that the client got for a code. Returns their number of rows.
int revokeIssuedFor(TokenStore& store, const std::string& codeDigest, const std::string& clientId);

// Deletes the rows that expired so long ago that nobody will use their refresh tokens. The
// library's Purge() would end every login whose access token has expired.
void purgeLongExpired(TokenStore& store);

}  // namespace authserver
