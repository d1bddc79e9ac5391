// Whether the database can be used at all, found out before the library tries: it would make a
// database where there is none.

#pragma once

#include <string>

namespace oauthctl {

enum class Access {
  kRead,
  kWrite,
  kMake  // write, where it may be missing
};

// Enters the folder of the database, and throws what stands in the way.
void requireDatabase(Access access);

bool databaseExists();

}  // namespace oauthctl
