// GET /userinfo: the protected resource. A request with an access token of the scope "profile" in
// the header Authorization (RFC 6750) gets the name of the token's user.

#include "clients.h"
#include "endpoint.h"
#include "scope.h"
#include "store_errors.h"
#include "stored_text.h"
#include "tokens.h"
#include "users.h"

namespace authserver {
namespace {

constexpr char kChallenge[] = "Bearer realm=\"authserver\"";

Refusal refused(int status, const std::string& error, const std::string& words,
                const std::string& more = "") {
  const std::string details =
      ", error=\"" + error + "\", error_description=\"" + words + "\"" + more;
  return {status, error, words, {{"WWW-Authenticate", kChallenge + details}}};
}

// Verify() returns the user of a token but not its client, which needs a second look-up: the tokens
// of a disabled client are void.
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
  const std::string presented = Request::credentials("Bearer").value_or("");
  // A request without a token gets no error code (RFC 6750, section 3.1).
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

int main() { return authserver::serve("userinfo", authserver::userinfo, authserver::jsonRefusal); }
