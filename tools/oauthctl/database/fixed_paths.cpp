#include "database/fixed_paths.h"

#include "oauth_names.h"

namespace oauthctl::fixed_paths {

namespace path = ZEVOOAUTHSERVER::names::path;

std::string folder() { return path::kFolder; }
std::string database() { return path::kDatabase; }
std::string settings() { return path::kSettings; }
std::string debugMarker() { return path::kDebugMarker; }

}  // namespace oauthctl::fixed_paths
