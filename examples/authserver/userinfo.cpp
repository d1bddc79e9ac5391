// GET /userinfo: the protected resource. Who presents an access token with the scope "profile" in
// the header Authorization (RFC 6750) learns the name of its user.

#include <strings.h>

#include "clients.h"
#include "endpoint.h"
#include "scope.h"
#include "store_errors.h"
#include "stored_text.h"
#include "tokens.h"
#include "users.h"

namespace authserver {
namespace {

constexpr char kBearer[] = "Bearer ";

constexpr char kChallenge[] = "Bearer realm=\"authserver\"";

Refusal refused(int status, const std::string& error, const std::string& words,
                const std::string& more = "") {
  const std::string details =
      ", error=\"" + error + "\", error_description=\"" + words + "\"" + more;
  return {status, error, words, {{"WWW-Authenticate", kChallenge + details}}};
}

// "" if the request brings none.
std::string presentedToken() {
  const std::string header = Request::authorization();
  if (strncasecmp(header.c_str(), kBearer, sizeof kBearer - 1) != 0) return "";
  return header.substr(sizeof kBearer - 1);
}

// Verify() tells whom a token speaks for but not which client holds it, which is looked up apart:
// the tokens of a disabled client are worth nothing.
std::string userOf(const std::string& presented) {
  TokenStore tokens;
  Json::Value verified;
  const bool valid = attempt(tokens, [&] { return tokens.Verify(presented, verified); });
  const auto token = valid ? findAccessToken(tokens, presented) : std::nullopt;
  if (!token || !findClient(token->grant.clientId))
    throw refused(401, "invalid_token", "The access token is not valid.");
  if (!contains(storedText(verified, "scope"), kProfileScope))
    throw refused(403, "insufficient_scope", "The scope profile is needed.",
                  std::string(", scope=\"") + kProfileScope + "\"");
  return storedText(verified, "username");
}

Response userinfo(const Request&) {
  const std::string presented = presentedToken();
  // Who tried nothing is told of no error (RFC 6750, section 3.1).
  if (presented.empty()) return {401, {{"WWW-Authenticate", kChallenge}}, ""};
  const std::optional<User> user = findUser(userOf(presented));
  if (!user) throw refused(401, "invalid_token", "The user is gone.");
  Json::Value document;
  document["sub"] = user->name;
  document["name"] = user->displayName;
  return jsonResponse(200, document);
}

}  // namespace
}  // namespace authserver

int main() {
  return authserver::serve({"GET", "HEAD"}, authserver::userinfo, authserver::jsonRefusal);
}
