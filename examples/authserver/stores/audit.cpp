#include "audit.h"

#include <iostream>

#include "oauth_log.h"
#include "oauth_utils.h"

namespace authserver {

void audit(const std::string& event) {
  const std::string line = "authserver: " + event + " from " + getRemoteIP();
  ZEVOOAUTHSERVER::OAUTHDBLog log("oauth_log");
  if (!log.Add(line)) std::cerr << "not in the audit log: " + line + '\n';
}

std::string quotedForLog(const std::string& text) {
  constexpr std::size_t kLongest = 64;
  constexpr char kHexDigits[] = "0123456789abcdef";
  std::string result = "\"";
  for (const unsigned char c : text.substr(0, kLongest)) {
    const bool plain =
        c >= ' ' && c < 127 && std::string("\"\\<>&").find(char(c)) == std::string::npos;
    if (plain)
      result += static_cast<char>(c);
    else
      result.append({'\\', 'x', kHexDigits[c >> 4], kHexDigits[c & 15]});
  }
  return result + (text.size() > kLongest ? "...\"" : "\"");
}

}  // namespace authserver
