// The folder of the database. It belongs to the server's user, who can put any file there under any
// name: journals that name other files, links, pipes. So root works in it with that user's ids, in
// whose hands they do no more than he could do himself, and by a descriptor of the folder.

#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

namespace oauthctl {

class DatabaseFolder {
 public:
  // Opens the folder and, if root runs this program, becomes its owner for the rest of the
  // program. The first call comes before anything in the folder is touched, and after the
  // operator's own files are opened. Throws what stands in the way.
  static const DatabaseFolder& enter();

  int descriptor() const { return descriptor_; }
  // Root has become the owner.
  bool isOwnersView() const { return isOwnersView_; }
  uid_t owner() const { return status_.st_uid; }

  // The entry itself, not what a link names; nothing, with errno set, if it cannot be had.
  std::optional<struct stat> look(const std::string& name) const;
  // By the effective ids, as every later open.
  bool may(const std::string& name, int mode) const;

 private:
  DatabaseFolder();
  void becomeOwner();

  const int descriptor_;  // as long as the program runs
  struct stat status_ = {};
  bool isOwnersView_ = false;
};

// The last part of a path.
std::string nameOf(const std::string& path);

}  // namespace oauthctl
