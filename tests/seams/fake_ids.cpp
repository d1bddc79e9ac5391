#include "fake_ids.h"

#include <unistd.h>

#include <cerrno>
#include <map>

#include "own_work.h"

namespace {

struct State {
  bool faked = false;
  unsigned user = 0, group = 0;
  std::map<std::string, int> refusals;
  std::vector<std::string> calls;
};
State state;

int change(const char* name, unsigned& id, unsigned real, unsigned effective, unsigned saved) {
  const OwnWork seam;
  const std::string call = std::string(name) + "(" + std::to_string(static_cast<int>(real)) + ", " +
                           std::to_string(static_cast<int>(effective)) + ", " +
                           std::to_string(static_cast<int>(saved)) + ")";
  state.calls.push_back(call);
  const auto refusal = state.refusals.find(call);
  if (!state.faked || refusal != state.refusals.end()) {
    errno = state.faked ? refusal->second : EPERM;
    return -1;
  }
  id = effective;
  return 0;
}

}  // namespace

FakeIds::FakeIds() {
  state = State();
  state.faked = true;
}
FakeIds::~FakeIds() { state = State(); }
void FakeIds::become(unsigned user, unsigned group) {
  state.user = user;
  state.group = group;
}
void FakeIds::refuse(const std::string& call, int error) { state.refusals[call] = error; }
const std::vector<std::string>& FakeIds::calls() const { return state.calls; }
unsigned FakeIds::user() const { return state.user; }
unsigned FakeIds::group() const { return state.group; }

extern "C" uid_t geteuid() noexcept { return state.user; }
extern "C" gid_t getegid() noexcept { return state.group; }
extern "C" int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  return change("setresuid", state.user, real, effective, saved);
}
extern "C" int setresgid(gid_t real, gid_t effective, gid_t saved) noexcept {
  return change("setresgid", state.group, real, effective, saved);
}
