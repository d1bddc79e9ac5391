// Redirect URIs as the client registry keeps them.

#pragma once

#include <string>

namespace ZEVOOAUTHSERVER {

// The URI without a leading "https://" or "http://".
inline std::string withoutScheme(const std::string& uri) {
  for (const std::string scheme : {"https://", "http://"})
    if (uri.compare(0, scheme.size(), scheme) == 0) return uri.substr(scheme.size());
  return uri;
}

}  // namespace ZEVOOAUTHSERVER
