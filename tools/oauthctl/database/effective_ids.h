// The effective user and group of this process: they decide what it may do with files.

#pragma once

#include <sys/types.h>

namespace oauthctl {

struct Ids {
  uid_t user;
  gid_t group;
};

Ids effectiveIds();

// What becomes of root's ids when root takes those of another user.
enum class RootIds {
  kGiveUp,  // root's rights are lost, for the library too
  kKeep     // real and saved ids stay root's; the user can neither signal nor trace this process
};

// Takes the ids and the groups of this user until the program ends. A user whom the system does not
// know gets the group fallback. Throws a Failure if the system refuses.
void becomeUser(uid_t user, gid_t fallback, RootIds rootIds);

// The process has these ids during the life of the object, and then its former ids again. If they
// cannot be restored, the program ends.
class ActingAs {
 public:
  explicit ActingAs(Ids ids);
  ~ActingAs();
  ActingAs(const ActingAs&) = delete;
  ActingAs& operator=(const ActingAs&) = delete;

 private:
  const Ids before_;
};

}  // namespace oauthctl
