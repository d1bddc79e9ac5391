#include "fake_clock.h"

#include <atomic>
#include <ctime>

namespace {
std::atomic<bool> faked{false};
std::atomic<std::int64_t> fakeNow{0};
}  // namespace

FakeClock::FakeClock() {
  set(1'700'000'000);
  faked = true;
}
FakeClock::~FakeClock() { faked = false; }
void FakeClock::set(std::int64_t now) { fakeNow = now; }
void FakeClock::advance(std::int64_t seconds) { fakeNow += seconds; }
std::int64_t FakeClock::now() const { return fakeNow; }

extern "C" time_t time(time_t* out) noexcept {
  time_t now;
  if (faked) {
    now = static_cast<time_t>(fakeNow.load());
  } else {
    timespec real;
    clock_gettime(CLOCK_REALTIME, &real);
    now = real.tv_sec;
  }
  if (out != nullptr) *out = now;
  return now;
}
