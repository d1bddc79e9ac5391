#include "database_access.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "exit_code.h"
#include "fixed_paths.h"

namespace oauthctl {
namespace {

[[noreturn]] void unavailable(const std::string& line) {
  throw Failure(ExitCode::kUnavailable, line);
}

// By the effective user, as every later open.
bool may(const std::string& path, int mode) {
  return faccessat(AT_FDCWD, path.c_str(), mode, AT_EACCESS) == 0;
}

void requireFolder() {
  const std::string folder = fixed_paths::folder();
  struct stat status;
  if (stat(folder.c_str(), &status) != 0 && errno != EACCES)
    unavailable("there is no folder " + folder + " for the database: is the server installed?");
  if (!may(folder, X_OK)) unavailable(mayNot("look into " + folder));
}

void requireWritableFolder() {
  const std::string folder = fixed_paths::folder();
  if (!may(folder, W_OK | X_OK)) unavailable(mayNot("write to " + folder));
}

}  // namespace

std::string mayNot(const std::string& what) {
  return "you may not " + what + ": run oauthctl as root or as the server's user";
}

void requireDatabase(Access access) {
  const std::string path = fixed_paths::database();
  requireFolder();
  if (access != Access::kRead) requireWritableFolder();
  struct stat status;
  if (stat(path.c_str(), &status) != 0) {
    if (errno != ENOENT) unavailable("cannot look at " + path + ": " + std::strerror(errno));
    if (access == Access::kMake) return;
    unavailable("there is no database " + path + ": 'oauthctl client add' or the server makes it");
  }
  if (!S_ISREG(status.st_mode)) unavailable(path + " is not a regular file");
  if (!may(path, R_OK)) unavailable(mayNot("read " + path));
  if (access != Access::kRead && !may(path, W_OK)) unavailable(mayNot("write " + path));
  if (status.st_size == 0 && access != Access::kMake)
    unavailable(path + " is empty: 'oauthctl client add' or the server fills it");
}

bool databaseExists() { return may(fixed_paths::database(), F_OK); }

void giveToFolderOwner(const std::string& path) {
  struct stat status;
  if (geteuid() != 0 || stat(fixed_paths::folder().c_str(), &status) != 0) return;
  // Where this is refused the file stays root's, which the library can use just as well.
  static_cast<void>(!lchown(path.c_str(), status.st_uid, status.st_gid));
}

}  // namespace oauthctl
