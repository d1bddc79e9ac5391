// Checks the files around the database, without changing them.

#pragma once

#include <string>

#include "checks/finding.h"

namespace oauthctl {

// Checks the mode of the database's folder, or of a folder above it.
Findings checkFolder(const std::string& path);

// Checks owner, mode and names of the database and its folder.
Findings checkFiles();

// Looks for a journal that a program left behind when it died. Not all of its changes are in the
// database. The next program that opens the database rolls them back, so a check must not open it.
Findings checkJournal();

// Checks the settings file, and whether it and the marker file switch diagnostics on.
Findings checkSettings();

}  // namespace oauthctl
