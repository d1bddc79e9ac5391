// Files that are made from the table of commands, and kept beside it.

#pragma once

#include <string>

namespace oauthctl {

std::string bashCompletion();  // oauthctl.bash
std::string manualPage();      // oauthctl.1

}  // namespace oauthctl
