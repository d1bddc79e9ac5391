#include "session.h"

#include <charconv>
#include <ctime>
#include <optional>

#include "configuration.h"
#include "digest.h"
#include "random_bytes.h"

namespace authserver {
namespace {

constexpr long long kLifetime = 3600;  // seconds

bool overHttps() { return issuer().rfind("https://", 0) == 0; }

// A browser takes the prefix from https only, and then from this very host and no neighbour.
std::string cookieName() { return overHttps() ? "__Host-authserver" : "authserver"; }

std::string signatureOf(const std::string& content) {
  return authenticator(sessionKey(), "session\n" + content);
}

// A cookie is "<user in base64url>.<expiry>.<nonce>.<signature of all before>".
std::optional<Session> verified(const std::string& cookie) {
  const std::size_t end = cookie.rfind('.');
  if (end == std::string::npos) return std::nullopt;
  const std::string content = cookie.substr(0, end);
  if (!equalSecrets(cookie.substr(end + 1), signatureOf(content))) return std::nullopt;
  const std::size_t dot = content.find('.');
  long long expiry = 0;
  std::from_chars(content.data() + dot + 1, content.data() + content.size(), expiry);
  if (expiry < static_cast<long long>(std::time(nullptr))) return std::nullopt;
  return Session{cookie, fromBase64url(content.substr(0, dot))};
}

}  // namespace

Session currentSession(const Request& request) {
  for (const std::string& cookie : request.cookies(cookieName()))
    if (const auto session = verified(cookie)) return *session;
  return newSession("");
}

Session newSession(const std::string& user) {
  const long long expiry = static_cast<long long>(std::time(nullptr)) + kLifetime;
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
