#include "database_access.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "database_folder.h"
#include "exit_code.h"
#include "fixed_paths.h"

namespace oauthctl {
namespace {

[[noreturn]] void unavailable(const std::string& line) {
  throw Failure(ExitCode::kUnavailable, line);
}

// Root who works with the owner's ids is told how to help the owner.
[[noreturn]] void mayNot(const std::string& what, const std::string& remedy) {
  const DatabaseFolder& folder = DatabaseFolder::enter();
  if (!folder.isOwnersView())
    unavailable("you may not " + what + ": run oauthctl as root or as the server's user");
  unavailable("user " + std::to_string(folder.owner()) + ", who owns the folder, may not " + what +
              ": " + remedy);
}

void requireFolder(int mode, const std::string& what) {
  const std::string path = fixed_paths::folder();
  if (!DatabaseFolder::enter().may(".", mode))
    mayNot(what + " " + path, "run 'chmod u+rwx " + path + "'");
}

void requireFile(const struct stat& status, int mode, const char* what) {
  const std::string path = fixed_paths::database();
  const DatabaseFolder& folder = DatabaseFolder::enter();
  if (folder.may(nameOf(path), mode)) return;
  // Nothing that would give away a file behind a link, or behind another name.
  std::string remedy = "run 'chown -h " + std::to_string(folder.owner()) + " " + path +
                       "', it belongs to user " + std::to_string(status.st_uid);
  if (status.st_uid == folder.owner()) remedy = "run 'chmod u+rw " + path + "'";
  if (status.st_nlink > 1) remedy = "it has other names too, find out who made it";
  mayNot(std::string(what) + " " + path, remedy);
}

}  // namespace

void requireDatabase(Access access) {
  const std::string path = fixed_paths::database();
  if (DatabaseFolder::enter().isUnsafe())
    unavailable(fixed_paths::folder() +
                " belongs to root and others may write to it, which makes root do what they want: "
                "chown it to the server's user, or chmod go-w");
  requireFolder(X_OK, "look into");
  if (access != Access::kRead) requireFolder(W_OK | X_OK, "write to");
  const std::optional<struct stat> status = DatabaseFolder::enter().look(nameOf(path));
  if (!status) {
    if (errno != ENOENT) unavailable("cannot look at " + path + ": " + std::strerror(errno));
    if (access == Access::kMake) return;
    unavailable("there is no database " + path + ": 'oauthctl client add' or the server makes it");
  }
  if (S_ISLNK(status->st_mode)) unavailable(path + " is a link: put the database itself there");
  if (!S_ISREG(status->st_mode)) unavailable(path + " is not a regular file");
  requireFile(*status, R_OK, "read");
  if (access != Access::kRead) requireFile(*status, W_OK, "write");
  if (status->st_size == 0 && access != Access::kMake)
    unavailable(path + " is empty: 'oauthctl client add' or the server fills it");
}

bool databaseExists() {
  return DatabaseFolder::enter().look(nameOf(fixed_paths::database())).has_value();
}

}  // namespace oauthctl
