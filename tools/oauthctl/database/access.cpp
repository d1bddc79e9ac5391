#include "database/access.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "database/fixed_paths.h"
#include "database/folder.h"
#include "terminal/exit_code.h"

namespace oauthctl {
namespace {

// The remedy is for root, who works here with the ids of the folder's owner.
[[noreturn]] void throwNotAllowed(const std::string& what, const std::string& remedy) {
  const DatabaseFolder& folder = DatabaseFolder::enter();
  if (!folder.user())
    throwUnavailable("you may not " + what + ": run oauthctl as root or as the server's user");
  throwUnavailable("user " + std::to_string(*folder.user()) +
                   ", whose ids root takes here, may not " + what + ": " + remedy);
}

void requireFolder(int mode, const std::string& what) {
  const std::string path = fixed_paths::folder();
  const DatabaseFolder& folder = DatabaseFolder::enter();
  if (folder.mayAccess(".", mode)) return;
  std::string remedy = "run 'chmod u+rwx " + path + "'";
  if (folder.owner() != folder.user().value_or(geteuid()))
    remedy = "it belongs to user " + std::to_string(folder.owner()) + ", find out who put it there";
  throwNotAllowed(what + " " + path, remedy);
}

void requireFile(const struct stat& status, int mode, const char* what) {
  const std::string path = fixed_paths::database();
  const DatabaseFolder& folder = DatabaseFolder::enter();
  if (folder.mayAccess(nameOf(path), mode)) return;
  // Suggest no command that would give away another file, behind a link or a second name.
  const uid_t user = folder.user().value_or(geteuid());
  std::string remedy = "run 'chown -h " + std::to_string(user) + " " + path +
                       "', it belongs to user " + std::to_string(status.st_uid);
  if (status.st_uid == user) remedy = "run 'chmod u+rw " + path + "'";
  if (status.st_nlink > 1) remedy = "it has other names too, find out who made it";
  throwNotAllowed(std::string(what) + " " + path, remedy);
}

// SQLite would wait for ever to open a pipe.
void requireRegularJournals() {
  for (const char* const suffix : {"-journal", "-wal", "-shm"}) {
    const std::string path = fixed_paths::database() + suffix;
    const std::optional<struct stat> status = DatabaseFolder::enter().lstatOf(nameOf(path));
    if (status && !S_ISREG(status->st_mode))
      throwUnavailable(path + " is not a regular file: find out who made it, and remove it");
  }
}

}  // namespace

void requireDatabase(Access access) {
  const std::string path = fixed_paths::database();
  if (const std::string unsafe = DatabaseFolder::enter().unsafeForRoot(); !unsafe.empty())
    throwUnavailable(
        unsafe +
        " belongs to root and others may write to it, which makes root do what they want: "
        "chown it to the server's user, or chmod go-w");
  requireFolder(X_OK, "look into");
  if (access != Access::kRead) requireFolder(W_OK | X_OK, "write to");
  const std::optional<struct stat> status = DatabaseFolder::enter().lstatOf(nameOf(path));
  if (!status) {
    if (errno != ENOENT) throwUnavailable("cannot look at " + path + ": " + std::strerror(errno));
    if (access == Access::kMake) return;
    throwUnavailable("there is no database " + path +
                     ": 'oauthctl client add' or the server makes it");
  }
  if (S_ISLNK(status->st_mode))
    throwUnavailable(path + " is a link: put the database itself there");
  requireRegularJournals();
  if (!S_ISREG(status->st_mode)) throwUnavailable(path + " is not a regular file");
  requireFile(*status, R_OK, "read");
  if (access != Access::kRead) requireFile(*status, W_OK, "write");
  if (status->st_size == 0 && access != Access::kMake)
    throwUnavailable(path + " is empty: 'oauthctl client add' or the server fills it");
}

bool databaseExists() {
  return DatabaseFolder::enter().lstatOf(nameOf(fixed_paths::database())).has_value();
}

}  // namespace oauthctl
