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

// error is "" for a request that tried nothing (RFC 6750, section 3.1).
Refusal unauthorized(int status, const std::string& error, const std::string& words,
                     const std::string& more = "") {
  const std::string details =
      error.empty() ? "" : ", error=\"" + error + "\", error_description=\"" + words + "\"" + more;
  return {status,
          error.empty() ? "invalid_request" : error,
          words,
          {{"WWW-Authenticate", "Bearer realm=\"authserver\"" + details}}};
}

std::string presentedToken() {
  const std::string header = Request::authorization();
  if (strncasecmp(header.c_str(), kBearer, sizeof kBearer - 1) != 0)
    throw unauthorized(401, "", "An access token is needed.");
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
    throw unauthorized(401, "invalid_token", "The access token is not valid.");
  if (!contains(storedText(verified, "scope"), kProfileScope))
    throw unauthorized(403, "insufficient_scope", "The scope profile is needed.",
                       std::string(", scope=\"") + kProfileScope + "\"");
  return storedText(verified, "username");
}

Response userinfo(const Request&) {
  const std::optional<User> user = findUser(userOf(presentedToken()));
  if (!user) throw unauthorized(401, "invalid_token", "The user is gone.");
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
