#include "fixed_paths.h"

namespace oauthctl::fixed_paths {

std::string folder() { return "/var/packages/Keyloft/target/etc"; }
std::string database() { return folder() + "/oauth.db"; }
std::string settings() { return folder() + "/oauth.cfg"; }
std::string debugMarker() { return "/tmp/zevooauth_debug"; }

}  // namespace oauthctl::fixed_paths
