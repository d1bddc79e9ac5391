// POST /introspect: what a token is good for (RFC 7662). A client learns about its own tokens; one
// registered for the scope "introspect", such as a resource server, about everybody's access
// tokens. A refresh token is nobody's business but its client's.

#include <ctime>

#include "client_authentication.h"
#include "configuration.h"
#include "endpoint.h"
#include "scope.h"
#include "tokens.h"
#include "users.h"

namespace authserver {
namespace {

bool maySeeAccess(const Client& client, const Token& token) {
  if (token.grant.clientId == client.id) return true;
  // The tokens of a disabled client are worth nothing.
  return contains(client.scope, kIntrospectScope) && findClient(token.grant.clientId).has_value();
}

// What a user allowed ends with the user.
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
    const bool expired = static_cast<std::int64_t>(std::time(nullptr)) > token->expires;
    if (expired || !maySeeAccess(client, *token) || !hasUser(*token)) return inactive();
    Json::Value document = describe(*token, token->grant.accessScope);
    document["token_type"] = "Bearer";
    document["exp"] = static_cast<Json::Int64>(token->expires);
    return document;
  }
  const auto token = findRefreshToken(tokens, presented);  // of these none expires by itself
  if (!token || token->grant.clientId != client.id || !hasUser(*token)) return inactive();
  return describe(*token, token->grant.refreshScope);
}

Response introspect(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  const std::string presented = http.get("token");
  if (presented.empty()) throw invalidRequest("token is missing.");
  return jsonResponse(200, stateOf(presented, client));
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve({"POST"}, authserver::introspect, authserver::jsonRefusal); }
