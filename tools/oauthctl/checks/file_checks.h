// Whether the files around the database are as they should be. Reads, and changes nothing.

#pragma once

#include <string>

#include "finding.h"

namespace oauthctl {

// The mode of the database's folder, or of one above it.
Findings checkFolder(const std::string& path);

// Owner, mode and names of the database and its folder.
Findings checkFiles();

// A journal that a program left behind when it died. Its rows are not all in the database, and the
// next program to open it rolls them back, so that a check must not open it either.
Findings checkJournal();

// The settings file, and the diagnostics that it and the marker file switch on.
Findings checkSettings();

}  // namespace oauthctl
