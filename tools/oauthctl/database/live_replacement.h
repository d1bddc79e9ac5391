// Replaces the contents of the database while programs use it.

#pragma once

#include <string>

#include "database/image.h"

namespace oauthctl {

// Replaces everything at once: other programs see either all the old rows or all the new ones.
// Before that it copies the old file to a new one beside the database; returns the path of the
// copy,
// "" if there was nothing to keep. If the database stays busy for longer than the library would
// wait, throws a Failure and changes nothing.
std::string replaceLiveDatabase(DatabaseImage& image);

}  // namespace oauthctl
