// The paths of the library's files. They are fixed because this program runs as root. The tests
// link other functions instead of these.

#pragma once

#include <string>

namespace oauthctl::fixed_paths {

std::string folder();       // of the database and the settings
std::string database();     // "oauth.db"
std::string settings();     // "oauth.cfg"
std::string debugMarker();  // switches diagnostics on

}  // namespace oauthctl::fixed_paths
