#include "database/folder.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <sstream>

#include "database/fixed_paths.h"
#include "terminal/exit_code.h"

namespace oauthctl {
namespace {

int openFolder(int parent, const std::string& name) {
  const int descriptor = openat(parent, name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
  if (descriptor >= 0) return descriptor;
  const std::string path = fixed_paths::folder();
  if (errno == ENOENT || errno == ENOTDIR)
    throwUnavailable("there is no folder " + path + " for the database: is the server installed?");
  if (errno == EACCES)
    throwUnavailable("you may not look into " + path +
                     ": run oauthctl as root or as the server's user");
  throwUnavailable("cannot open the folder " + path + ": " + std::strerror(errno));
}

}  // namespace

// Opens one folder after the other, from the first one on: the owner of a folder can replace
// everything below it.
DatabaseFolder::DatabaseFolder(RootIds rootIds) {
  std::istringstream names(fixed_paths::folder());
  std::string path;
  for (std::string name; std::getline(names, name, '/');) {
    if (name.empty()) continue;
    path += "/" + name;
    const bool isFirst = !descriptor_.isOpen();
    descriptor_ = ZEVOOAUTHSERVER::Descriptor(isFirst ? openFolder(AT_FDCWD, path)
                                                      : openFolder(descriptor_.value(), name));
    enterFolder(path, rootIds);
  }
  // Others can put files beside the database. The sticky bit does not prevent that.
  if (isOpenToOthers()) unsafe_ = path;
}

void DatabaseFolder::enterFolder(const std::string& path, RootIds rootIds) {
  if (fstat(descriptor_.value(), &status_) != 0)
    throwUnavailable("cannot look at " + path + ": " + std::strerror(errno));
  if (geteuid() != 0) return;
  if (status_.st_uid != 0) {
    becomeUser(status_.st_uid, status_.st_gid, rootIds);
    user_ = status_.st_uid;
  } else if (isOpenToOthers() && (status_.st_mode & S_ISVTX) == 0) {
    unsafe_ = path;
  }
}

bool DatabaseFolder::isOpenToOthers() const { return (status_.st_mode & (S_IWGRP | S_IWOTH)) != 0; }

std::string DatabaseFolder::unsafeForRoot() const { return geteuid() == 0 ? unsafe_ : ""; }

const DatabaseFolder& DatabaseFolder::enter(RootIds rootIds) {
  static const DatabaseFolder folder(rootIds);
  return folder;
}

std::optional<struct stat> DatabaseFolder::lstatOf(const std::string& name) const {
  struct stat status;
  if (fstatat(descriptor_.value(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0)
    return std::nullopt;
  return status;
}

bool DatabaseFolder::mayAccess(const std::string& name, int mode) const {
  return faccessat(descriptor_.value(), name.c_str(), mode, AT_EACCESS) == 0;
}

std::string nameOf(const std::string& path) { return path.substr(path.rfind('/') + 1); }

}  // namespace oauthctl
