#include "redirect_uri.h"

#include <algorithm>
#include <cstring>
#include <regex>

namespace authserver {
namespace {

constexpr char kHttps[] = "https://", kHttp[] = "http://";

// A reversed domain name and one slash (RFC 8252, section 7.1), which neither "localhost:8080/done"
// nor "javascript:/..." has.
bool hasPrivateScheme(const std::string& uri) {
  static const std::regex pattern(R"([a-z][a-z0-9-]*(\.[a-z0-9-]+)+:/([^/].*)?)");
  return std::regex_match(uri, pattern);
}

// The part between scheme and path: host and, perhaps, port.
std::string authorityOf(const std::string& withoutScheme) {
  return withoutScheme.substr(0, withoutScheme.find_first_of("/?"));
}

bool isHost(const std::string& authority) {
  static const std::regex pattern(R"((\[[0-9A-Fa-f:.]+\]|[A-Za-z0-9.-]+)(:[0-9]+)?)");
  return std::regex_match(authority, pattern);
}

bool isThisMachine(const std::string& authority) {
  static const std::regex pattern(R"((127\.0\.0\.1|\[::1\]|localhost)(:[0-9]+)?)");
  return std::regex_match(authority, pattern);
}

// Has no fragment, and no character that browsers interpret in another way than this server.
bool hasPlainCharacters(const std::string& uri) {
  return std::all_of(uri.begin(), uri.end(),
                     [](char c) { return c > ' ' && c < 127 && c != '#' && c != '\\'; });
}

bool startsWith(const std::string& text, const std::string& start) {
  return text.compare(0, start.size(), start) == 0;
}

std::string withoutScheme(const std::string& uri) {
  for (const char* const scheme : {kHttps, kHttp})
    if (startsWith(uri, scheme)) return uri.substr(std::strlen(scheme));
  return uri;
}

}  // namespace

bool isRegistered(const std::string& presented, const std::string& stored) {
  if (!hasPlainCharacters(stored)) return false;
  if (hasPrivateScheme(stored)) return presented == stored;
  const std::string bare = withoutScheme(stored), authority = authorityOf(bare);
  if (!isHost(authority) || (stored != bare && stored != presented)) return false;
  return presented == kHttps + bare || (isThisMachine(authority) && presented == kHttp + bare);
}

bool isOrigin(const std::string& uri) {
  const std::string host = withoutScheme(uri);
  return isHost(host) && isRegistrable(uri);
}

bool isRegistrable(const std::string& uri) { return isRegistered(uri, withoutScheme(uri)); }

std::string destinationOf(const std::string& uri) {
  if (hasPrivateScheme(uri)) return uri.substr(0, uri.find(':'));
  return authorityOf(withoutScheme(uri));
}

std::string policySourceOf(const std::string& uri) {
  std::string scheme = uri.substr(0, uri.find(':') + 1);
  const std::string authority = authorityOf(withoutScheme(uri));
  // An app's URI has no host, and the policy's grammar has no addresses in brackets.
  if (hasPrivateScheme(uri) || authority.front() == '[') return scheme;
  return scheme + "//" + authority;
}

}  // namespace authserver
