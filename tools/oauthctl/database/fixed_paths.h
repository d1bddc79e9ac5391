// The files of the machine. They are fixed, as in the library, because this program runs as root;
// the tests link other answers.

#pragma once

#include <string>

namespace oauthctl::fixed_paths {

std::string folder();       // of the two files below
std::string database();     // "oauth.db"
std::string settings();     // "oauth.cfg"
std::string debugMarker();  // switches diagnostics on

}  // namespace oauthctl::fixed_paths
