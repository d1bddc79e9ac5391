#include "database_folder.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "effective_ids.h"
#include "exit_code.h"
#include "fixed_paths.h"

namespace oauthctl {
namespace {

[[noreturn]] void unavailable(const std::string& line) {
  throw Failure(ExitCode::kUnavailable, line);
}

int openFolder(const std::string& path) {
  const int descriptor = open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
  if (descriptor >= 0) return descriptor;
  if (errno == ENOENT || errno == ENOTDIR)
    unavailable("there is no folder " + path + " for the database: is the server installed?");
  if (errno == EACCES)
    unavailable("you may not look into " + path + ": run oauthctl as root or as the server's user");
  unavailable("cannot open the folder " + path + ": " + std::strerror(errno));
}

}  // namespace

DatabaseFolder::DatabaseFolder() : descriptor_(openFolder(fixed_paths::folder())) {
  if (fstat(descriptor_, &status_) != 0)
    unavailable("cannot look at " + fixed_paths::folder() + ": " + std::strerror(errno));
  if (geteuid() != 0 || status_.st_uid == 0) return;
  becomeUser(status_.st_uid, status_.st_gid);
  isOwnersView_ = true;
}

bool DatabaseFolder::isUnsafe() const {
  return geteuid() == 0 && (status_.st_mode & (S_IWGRP | S_IWOTH)) != 0;
}

const DatabaseFolder& DatabaseFolder::enter() {
  static const DatabaseFolder folder;
  return folder;
}

std::optional<struct stat> DatabaseFolder::look(const std::string& name) const {
  struct stat status;
  if (fstatat(descriptor_, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return std::nullopt;
  return status;
}

bool DatabaseFolder::may(const std::string& name, int mode) const {
  return faccessat(descriptor_, name.c_str(), mode, AT_EACCESS) == 0;
}

std::string nameOf(const std::string& path) { return path.substr(path.rfind('/') + 1); }

}  // namespace oauthctl
