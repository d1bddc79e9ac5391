// POST /revoke: a client gives up a token (RFC 7009). Access token and refresh token are one row
// and end together.

#include "client_authentication.h"
#include "endpoint.h"
#include "tokens.h"
#include "transaction.h"

namespace authserver {
namespace {

// RFC 7009 lets a client ignore the body, but there are those that insist on JSON.
Response revoked() { return jsonResponse(200, Json::Value(Json::objectValue)); }

Response revoke(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  const std::string presented = http.get("token");
  if (presented.empty()) throw invalidRequest("token is missing.");

  TokenStore tokens;
  Transaction transaction(tokens);
  std::optional<Token> token = findAccessToken(tokens, presented);
  if (!token) token = findRefreshToken(tokens, presented);
  if (!token) return revoked();  // what is not there needs no revoking
  if (token->grant.clientId != client.id)
    throw invalidGrant("The token was issued to another client.");
  attempt(tokens, [&] { return tokens.Revoke(token->id); });
  transaction.commit();
  return revoked();
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve({"POST"}, authserver::revoke, authserver::jsonRefusal); }
