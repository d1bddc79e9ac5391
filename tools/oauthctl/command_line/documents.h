// The files that oauthctl_documents makes from the table of commands.

#pragma once

#include <string>

namespace oauthctl {

// The contents of oauthctl.bash.
std::string bashCompletion();

// The contents of oauthctl.1, from those of oauthctl.1.in.
std::string manualPage(std::string pageTemplate);

}  // namespace oauthctl
