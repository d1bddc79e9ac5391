// GET /.well-known/oauth-authorization-server: what this server offers, and its URLs (RFC 8414).

#include "configuration.h"
#include "endpoint.h"
#include "endpoints.h"
#include "scope.h"

namespace authserver {
namespace {

Json::Value list(std::initializer_list<const char*> items) {
  Json::Value array(Json::arrayValue);
  for (const char* const item : items) array.append(item);
  return array;
}

Response metadata(const Request&) {
  const std::string base = issuer();
  Json::Value document;
  document["issuer"] = base;
  for (const Endpoint& endpoint : endpoints()) {
    if (endpoint.metadataName.empty()) continue;
    const std::string name = endpoint.metadataName + "_endpoint";
    document[name] = base + endpoint.path;
    if (endpoint.clientAuthenticates)
      document[name + "_auth_methods_supported"] =
          list({"client_secret_basic", "client_secret_post"});
  }
  for (const ScopeMeaning& scope : knownScopes()) document["scopes_supported"].append(scope.name);
  document["response_types_supported"] = list({"code"});
  document["response_modes_supported"] = list({"query"});
  document["grant_types_supported"] = list({"authorization_code", "refresh_token"});
  document["code_challenge_methods_supported"] = list({"S256"});
  document["authorization_response_iss_parameter_supported"] = true;
  return jsonResponse(200, document);
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve("metadata", authserver::metadata, authserver::jsonRefusal); }
