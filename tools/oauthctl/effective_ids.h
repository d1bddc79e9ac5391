// The effective user and group of this process, which decide what it may do with files.

#pragma once

#include <sys/types.h>

namespace oauthctl {

struct Ids {
  uid_t user;
  gid_t group;
};

Ids effectiveIds();

// Takes the effective ids and the groups of this user until the program ends. fallback is the group
// of a user whom the system does not know. Real and saved ids stay root's: so the library can raise
// its ids to open the database, and the user can neither signal nor trace this process. Throws a
// Failure if any of that is refused.
void becomeUser(uid_t user, gid_t fallback);

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
