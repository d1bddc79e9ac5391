// The effective user and group of this process, which decide what it may do with files.

#pragma once

#include <sys/types.h>

namespace oauthctl {

struct Ids {
  uid_t user;
  gid_t group;
};

Ids effectiveIds();

enum class Return {
  kNever,       // not even the library can raise its ids any more
  kByActingAs,  // real and saved ids stay root's; the user can neither signal nor trace this
                // process
};

// Takes the ids and the groups of this user until the program ends. fallback is the group of a user
// whom the system does not know. Throws a Failure if any of that is refused.
void becomeUser(uid_t user, gid_t fallback, Return way);

// Has these ids while it lives, then those from before. Ends the program if they do not come back.
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
