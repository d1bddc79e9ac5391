#include "session.h"

#include <optional>

#include "clock.h"
#include "configuration.h"
#include "decimal_text.h"
#include "digest.h"
#include "random_bytes.h"

namespace authserver {
namespace {

constexpr std::int64_t kLifetime = 3600;  // seconds

bool overHttps() { return issuer().rfind("https://", 0) == 0; }

// A browser accepts the prefix only by https, and only from this host itself.
std::string cookieName() { return overHttps() ? "__Host-authserver" : "authserver"; }

std::string signatureOf(const std::string& content) {
  return authenticator(sessionKey(), "session\n" + content);
}

// A cookie is "<user in base64url>.<expiry>.<nonce>.<signature of the three>".
std::optional<Session> verified(const std::string& cookie) {
  const std::size_t end = cookie.rfind('.');
  if (end == std::string::npos) return std::nullopt;
  const std::string content = cookie.substr(0, end);
  if (!equalSecrets(cookie.substr(end + 1), signatureOf(content))) return std::nullopt;
  const std::size_t user = content.find('.'), expiry = content.find('.', user + 1);
  if (fromDecimal(content.substr(user + 1, expiry - user - 1)) < unixNow()) return std::nullopt;
  return Session{cookie, fromBase64url(content.substr(0, user))};
}

}  // namespace

Session currentSession(const Request& request) {
  for (const std::string& cookie : request.cookies(cookieName()))
    if (const auto session = verified(cookie)) return *session;
  return newSession("");
}

Session newSession(const std::string& user) {
  const std::int64_t expiry = unixNow() + kLifetime;
  const std::string content =
      base64url(user) + '.' + std::to_string(expiry) + '.' + base64url(randomBytes(16));
  return {content + '.' + signatureOf(content), user};
}

Headers sessionHeaders(const Session& session) {
  return {{"Set-Cookie", cookieName() + '=' + session.cookie +
                             "; Path=/; Max-Age=" + std::to_string(kLifetime) +
                             "; HttpOnly; SameSite=Lax" + (overHttps() ? "; Secure" : "")}};
}

std::string formToken(const Session& session, const std::string& authorizationRequest) {
  return authenticator(sessionKey(), "form\n" + session.cookie + '\n' + authorizationRequest);
}

}  // namespace authserver
