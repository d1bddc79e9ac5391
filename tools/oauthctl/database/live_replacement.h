// Puts other contents into the database that programs are using.

#pragma once

#include <string>

#include "database_image.h"

namespace oauthctl {

// In one go: other programs see either all the old rows or all the new ones. What was there is kept
// first, beside the database; returns that file's path, "" if there was nothing. Throws a Failure,
// with nothing changed, if the database is busy for longer than the library would wait.
std::string replaceLiveDatabase(DatabaseImage& image);

}  // namespace oauthctl
