// POST /revoke: a client gives up a token (RFC 7009). Its access token and its refresh token are in
// one row and end together.

#include "client_authentication.h"
#include "endpoint.h"
#include "tokens.h"
#include "transaction.h"

namespace authserver {
namespace {

// A client may ignore the body (RFC 7009), but some clients require JSON.
Response revoked() { return jsonResponse(200, Json::Value(Json::objectValue)); }

Response revoke(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  const std::string presented = http.required("token");

  TokenStore tokens;
  Transaction transaction(tokens);
  std::optional<Token> token = findAccessToken(tokens, presented);
  if (!token) token = findRefreshToken(tokens, presented);
  if (!token) return revoked();  // an unknown token is a success (RFC 7009, section 2.2)
  if (token->grant.clientId != client.id)
    throw invalidGrant("The token was issued to another client.");
  attempt(tokens, [&] { return tokens.Revoke(token->id); });
  transaction.commit();
  return revoked();
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve("revoke", authserver::revoke, authserver::jsonRefusal); }
