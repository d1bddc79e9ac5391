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

// Throws what stands in the way.
void requireDatabase(Access access);

bool databaseExists();

// "/.../oauth.db is not readable: run oauthctl as root or as the server's user"
std::string mayNot(const std::string& what);

// Gives a file that root has made beside the database to whoever the folder belongs to.
void giveToFolderOwner(const std::string& path);

}  // namespace oauthctl
