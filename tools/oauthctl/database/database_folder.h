// The folder of the database. It belongs to the server's user, who can put any file there: a
// journal that names other files for deletion, a link, a pipe. Root would follow them. So root
// works in the folder with that user's ids, and can do no more there than that user can.

#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

#include "descriptor.h"
#include "effective_ids.h"

namespace oauthctl {

class DatabaseFolder {
 public:
  // Opens the folder. If root runs this program, it becomes the user who owns the folder, or the
  // first folder above that is not root's, until the program ends. Make the first call after the
  // operator's own files are open, and before anything in the folder is touched. Throws what stands
  // in the way.
  static const DatabaseFolder& enter(Return way = Return::kNever);

  int descriptor() const { return descriptor_.value(); }
  uid_t owner() const { return status_.st_uid; }
  // The user whom root has become.
  std::optional<uid_t> user() const { return user_; }
  // The folder, or the one above it, that belongs to root and that others may write to, if root
  // runs this program: there is no other user to become, and others decide what root does there.
  // "" if there is none.
  std::string unsafeForRoot() const;

  // The entry itself, not what a link names; nothing, with errno set, if it cannot be had.
  std::optional<struct stat> look(const std::string& name) const;
  // By the effective ids, as every later open.
  bool may(const std::string& name, int mode) const;

 private:
  explicit DatabaseFolder(Return way);
  void enterFolder(const std::string& path, Return way);
  bool isOpenToOthers() const;

  Descriptor descriptor_;  // as long as the program runs
  struct stat status_ = {};
  std::optional<uid_t> user_;
  std::string unsafe_;
};

// The last part of a path.
std::string nameOf(const std::string& path);

}  // namespace oauthctl
