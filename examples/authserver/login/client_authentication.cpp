#include "client_authentication.h"

#include <sodium.h>
#include <strings.h>

#include "audit.h"
#include "digest.h"
#include "form_encoding.h"
#include "refusal.h"

namespace authserver {
namespace {

constexpr char kBasic[] = "Basic ";

struct Credentials {
  std::string id, secret;
};

Refusal invalidClient() {
  return {401,
          "invalid_client",
          "The client is unknown or its secret is wrong.",
          {{"WWW-Authenticate", "Basic realm=\"authserver\""}}};
}

std::string fromBase64(const std::string& text) {
  std::string bytes(text.size(), '\0');
  std::size_t length = 0;
  if (sodium_base642bin(reinterpret_cast<unsigned char*>(bytes.data()), bytes.size(), text.data(),
                        text.size(), nullptr, &length, nullptr,
                        sodium_base64_VARIANT_ORIGINAL) != 0)
    throw invalidClient();
  bytes.resize(length);
  return bytes;
}

// Both halves are encoded like a form's values before they are joined (RFC 6749, section 2.3.1).
Credentials fromHeader(const std::string& header) {
  if (strncasecmp(header.c_str(), kBasic, sizeof kBasic - 1) != 0) throw invalidClient();
  const std::string pair = fromBase64(header.substr(sizeof kBasic - 1));
  const std::size_t colon = pair.find(':');
  if (colon == std::string::npos) throw invalidClient();
  const auto id = formDecoded(pair.substr(0, colon)), secret = formDecoded(pair.substr(colon + 1));
  if (!id || !secret) throw invalidClient();
  return {*id, *secret};
}

Credentials credentialsOf(const Request& request) {
  const std::string header = Request::authorization();
  const std::string id = request.get("client_id"), secret = request.get("client_secret");
  if (header.empty()) return {id, secret};
  Credentials credentials = fromHeader(header);
  if (!secret.empty() || (!id.empty() && id != credentials.id))
    throw invalidRequest("The client authenticates in two ways.");
  return credentials;
}

}  // namespace

Client authenticatedClient(const Request& request) {
  const Credentials given = credentialsOf(request);
  const std::optional<Client> client = findClient(given.id);
  // Compared for an unknown client too, so that the time does not tell whether there is one.
  const bool secretMatches = equalSecrets(given.secret, client ? client->secret : "");
  if (client && secretMatches && !given.secret.empty()) return *client;
  audit("client authentication failed for " + quotedForLog(given.id));
  throw invalidClient();
}

}  // namespace authserver
