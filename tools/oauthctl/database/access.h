// Checks that the database can be used, before the library opens it: the library would make a
// database where there is none.

#pragma once

namespace oauthctl {

enum class Access {
  kRead,
  kWrite,
  kMake  // write; the database may be missing
};

// Enters the folder of the database, and throws a Failure if the database cannot be used.
void requireDatabase(Access access);

bool databaseExists();

}  // namespace oauthctl
