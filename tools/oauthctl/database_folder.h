// The folder of the database. It belongs to the server's user, who can put any file there: a
// journal that names other files for deletion, a link, a pipe. Root would follow them. So root
// works in the folder with that user's ids, and can do no more there than that user can.

#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

namespace oauthctl {

class DatabaseFolder {
 public:
  // Opens the folder. If root runs this program, it becomes the folder's owner until the program
  // ends. Make the first call after the operator's own files are open, and before anything in the
  // folder is touched. Throws what stands in the way.
  static const DatabaseFolder& enter();

  int descriptor() const { return descriptor_; }
  // Root has become the owner.
  bool isOwnersView() const { return isOwnersView_; }
  // Root runs this program in a folder of root's that others may write to: there is no other owner
  // to become, and others decide what a program of root's does there.
  bool isUnsafe() const;
  uid_t owner() const { return status_.st_uid; }

  // The entry itself, not what a link names; nothing, with errno set, if it cannot be had.
  std::optional<struct stat> look(const std::string& name) const;
  // By the effective ids, as every later open.
  bool may(const std::string& name, int mode) const;

 private:
  DatabaseFolder();

  const int descriptor_;  // as long as the program runs
  struct stat status_ = {};
  bool isOwnersView_ = false;
};

// The last part of a path.
std::string nameOf(const std::string& path);

}  // namespace oauthctl
