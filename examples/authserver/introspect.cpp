// POST /introspect: what a token is valid for (RFC 7662). A client learns about its own tokens. A
// client with the scope "introspect", such as a resource server, also learns about the access
// tokens of all clients. Only its own client learns about a refresh token.

#include "client_authentication.h"
#include "clock.h"
#include "configuration.h"
#include "endpoint.h"
#include "scope.h"
#include "tokens.h"
#include "users.h"

namespace authserver {
namespace {

bool maySeeAccessToken(const Client& client, const Token& token) {
  if (token.grant.clientId == client.id) return true;
  // The tokens of a disabled client are void.
  return contains(client.scope, kIntrospectScope) && findClient(token.grant.clientId).has_value();
}

// A removed user's grants are void.
bool hasUser(const Token& token) { return findUser(token.grant.user).has_value(); }

Json::Value describe(const Token& token, const std::string& scope) {
  Json::Value document;
  document["active"] = true;
  document["scope"] = scope;
  document["client_id"] = token.grant.clientId;
  document["username"] = token.grant.user;
  document["sub"] = token.grant.user;
  document["iss"] = issuer();
  return document;
}

Json::Value inactive() {
  Json::Value document;
  document["active"] = false;
  return document;
}

Json::Value stateOf(const std::string& presented, const Client& client) {
  TokenStore tokens;
  if (const auto token = findAccessToken(tokens, presented)) {
    const bool expired = unixNow() > token->expires;
    if (expired || !maySeeAccessToken(client, *token) || !hasUser(*token)) return inactive();
    Json::Value document = describe(*token, token->grant.accessScope);
    document["token_type"] = "Bearer";
    document["exp"] = static_cast<Json::Int64>(token->expires);
    return document;
  }
  const auto token = findRefreshToken(tokens, presented);  // which never expires
  if (!token || token->grant.clientId != client.id || !hasUser(*token)) return inactive();
  return describe(*token, token->grant.refreshScope);
}

Response introspect(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  return jsonResponse(200, stateOf(http.required("token"), client));
}

}  // namespace
}  // namespace authserver

int main() {
  return authserver::serve("introspect", authserver::introspect, authserver::jsonRefusal);
}
