#include "fake_clock.h"

#include <ctime>
#include <mutex>
#include <optional>

namespace {
std::mutex guard;
std::optional<std::int64_t> fakeNow;
}  // namespace

FakeClock::FakeClock() { set(1'700'000'000); }
FakeClock::~FakeClock() {
  const std::lock_guard<std::mutex> lock(guard);
  fakeNow.reset();
}
void FakeClock::set(std::int64_t now) {
  const std::lock_guard<std::mutex> lock(guard);
  fakeNow = now;
}
void FakeClock::advance(std::int64_t seconds) { set(now() + seconds); }
std::int64_t FakeClock::now() const {
  const std::lock_guard<std::mutex> lock(guard);
  return fakeNow.value_or(0);
}

// Where a 32-bit build asks for 64-bit times, the compiler gives this function the name __time64.
extern "C" time_t time(time_t* out) noexcept {
  timespec real;
  clock_gettime(CLOCK_REALTIME, &real);
  const std::lock_guard<std::mutex> lock(guard);
  const auto now = static_cast<time_t>(fakeNow.value_or(real.tv_sec));
  if (out != nullptr) *out = now;
  return now;
}
