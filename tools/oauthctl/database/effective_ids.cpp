#include "database/effective_ids.h"

#include <grp.h>
#include <pwd.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "terminal/exit_code.h"

namespace oauthctl {
namespace {

constexpr uid_t kRoot = 0, kKeep = static_cast<uid_t>(-1);

// Becomes root first: only root may change the group.
bool setEffectiveIds(Ids ids) {
  const Ids now = effectiveIds();
  if (now.user == ids.user && now.group == ids.group) return true;
  return (now.user == kRoot || setresuid(kKeep, kRoot, kKeep) == 0) &&
         setresgid(kKeep, ids.group, kKeep) == 0 && setresuid(kKeep, ids.user, kKeep) == 0;
}

[[noreturn]] void throwRefused(uid_t user) {
  throwUnavailable("cannot take the ids of user " + std::to_string(user) + ": " +
                   std::strerror(errno));
}

}  // namespace

Ids effectiveIds() { return {geteuid(), getegid()}; }

void becomeUser(uid_t user, gid_t fallback, RootIds rootIds) {
  const passwd* const known = getpwuid(user);
  const gid_t group = known == nullptr ? fallback : known->pw_gid;
  const bool joined =
      known == nullptr ? setgroups(1, &group) == 0 : initgroups(known->pw_name, group) == 0;
  const auto setAllIds = [&] {
    return setresgid(group, group, group) == 0 && setresuid(user, user, user) == 0;
  };
  if (!joined || !(rootIds == RootIds::kGiveUp ? setAllIds() : setEffectiveIds({user, group})))
    throwRefused(user);
}

ActingAs::ActingAs(Ids ids) : before_(effectiveIds()) {
  if (!setEffectiveIds(ids)) throwRefused(ids.user);
}

ActingAs::~ActingAs() {
  const int error = errno;
  if (!setEffectiveIds(before_)) {
    constexpr char kLine[] = "oauthctl: cannot give up the ids of root\n";
    static_cast<void>(!write(STDERR_FILENO, kLine, sizeof kLine - 1));
    _exit(static_cast<int>(ExitCode::kUnavailable));
  }
  errno = error;
}

}  // namespace oauthctl
