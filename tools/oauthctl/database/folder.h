// The folder of the database. It belongs to the server's user, who can put any file there: a
// journal that names other files for deletion, a link, a pipe. With root's rights such a file could
// do damage. So root works in the folder with that user's ids.

#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

#include "database/effective_ids.h"
#include "descriptor.h"

namespace oauthctl {

class DatabaseFolder {
 public:
  // Opens the folder, once. If root runs this program, it takes the ids of the user who owns the
  // folder, or the first folder above that is not root's, until the program ends. Make the first
  // call after the operator's own files are open, and before anything in the folder is touched.
  // Throws a Failure if the folder cannot be opened.
  static const DatabaseFolder& enter(RootIds rootIds = RootIds::kGiveUp);

  int descriptor() const { return descriptor_.value(); }
  uid_t owner() const { return status_.st_uid; }
  // The user whose ids root has taken.
  std::optional<uid_t> user() const { return user_; }
  // The path of a folder that belongs to root and that others may write to: this one or one above
  // it. There is no other user whose ids root could take, and others decide what root does there.
  // "" if there is no such folder, or if root does not run this program.
  std::string unsafeForRoot() const;

  // The status of an entry; of the link itself if it is a link. Nothing, with errno set, if there
  // is no such entry or it cannot be reached.
  std::optional<struct stat> lstatOf(const std::string& name) const;
  // Whether the effective ids have this access; mode is as for access().
  bool mayAccess(const std::string& name, int mode) const;

 private:
  explicit DatabaseFolder(RootIds rootIds);
  void enterFolder(const std::string& path, RootIds rootIds);
  bool isOpenToOthers() const;

  ZEVOOAUTHSERVER::Descriptor descriptor_;  // stays open until the program ends
  struct stat status_ = {};
  std::optional<uid_t> user_;
  std::string unsafe_;  // see unsafeForRoot()
};

// The last part of a path.
std::string nameOf(const std::string& path);

}  // namespace oauthctl
