#include "client_authentication.h"

#include "audit.h"
#include "digest.h"
#include "form_encoding.h"
#include "refusal.h"

namespace authserver {
namespace {

struct Credentials {
  std::string id, secret;
};

Refusal invalidClient() {
  return {401,
          "invalid_client",
          "The client is unknown or its secret is wrong.",
          {{"WWW-Authenticate", "Basic realm=\"authserver\""}}};
}

// Both parts are encoded like the values of a form before they are joined (RFC 6749,
// section 2.3.1).
Credentials fromHeader() {
  const std::string pair = fromBase64(Request::credentials("Basic").value_or(""));
  const std::size_t colon = pair.find(':');
  if (colon == std::string::npos) throw invalidClient();
  const auto id = formDecoded(pair.substr(0, colon)), secret = formDecoded(pair.substr(colon + 1));
  if (!id || !secret) throw invalidClient();
  return {*id, *secret};
}

Credentials credentialsOf(const Request& request) {
  const std::string id = request.get("client_id"), secret = request.get("client_secret");
  if (Request::authorization().empty()) return {id, secret};
  Credentials credentials = fromHeader();
  if (!secret.empty() || (!id.empty() && id != credentials.id))
    throw invalidRequest("The client authenticates in two ways.");
  return credentials;
}

}  // namespace

Client authenticatedClient(const Request& request) {
  const Credentials given = credentialsOf(request);
  const std::optional<Client> client = findClient(given.id);
  // An unknown client's secret is compared too: the time must not reveal whether the client exists.
  const bool secretMatches = equalSecrets(given.secret, client ? client->secret : "");
  if (client && secretMatches && !given.secret.empty()) return *client;
  audit("client authentication failed for " + quotedForLog(given.id));
  throw invalidClient();
}

}  // namespace authserver
