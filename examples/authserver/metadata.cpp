// GET /.well-known/oauth-authorization-server: what this server can do and where (RFC 8414).

#include "configuration.h"
#include "endpoint.h"
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
  document["authorization_endpoint"] = base + "/authorize";
  document["token_endpoint"] = base + "/token";
  document["revocation_endpoint"] = base + "/revoke";
  document["introspection_endpoint"] = base + "/introspect";
  document["userinfo_endpoint"] = base + "/userinfo";
  for (const ScopeMeaning& scope : knownScopes()) document["scopes_supported"].append(scope.name);
  document["response_types_supported"] = list({"code"});
  document["response_modes_supported"] = list({"query"});
  document["grant_types_supported"] = list({"authorization_code", "refresh_token"});
  document["code_challenge_methods_supported"] = list({"S256"});
  document["authorization_response_iss_parameter_supported"] = true;
  for (const char* const endpoint : {"token", "revocation", "introspection"})
    document[std::string(endpoint) + "_endpoint_auth_methods_supported"] =
        list({"client_secret_basic", "client_secret_post"});
  return jsonResponse(200, document);
}

}  // namespace
}  // namespace authserver

int main() {
  return authserver::serve({"GET", "HEAD"}, authserver::metadata, authserver::jsonRefusal);
}
