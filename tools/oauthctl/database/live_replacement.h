// Replaces the contents of the database while programs use it.

#pragma once

#include <string>

#include "database/image.h"

namespace oauthctl {

// Replaces everything at once: other programs see either all the old rows or all the new ones. What
// was there is kept in another file beside the database. Returns the path of that file, "" if there
// was nothing to keep. Throws a Failure if the database stays busy for longer than the library
// would wait, or if a file cannot be written. Then the database is as before, or the message names
// the file that has what was there.
std::string replaceLiveDatabase(DatabaseImage& image);

}  // namespace oauthctl
