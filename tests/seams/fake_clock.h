// The clock behind time(). Linking this seam replaces time() in the whole program; without an
// object it tells the real time. The database's own clock is not affected.

#pragma once

#include <cstdint>

class FakeClock {
 public:
  // Unix seconds; starts at 1700000000.
  FakeClock();
  ~FakeClock();
  FakeClock(const FakeClock&) = delete;
  FakeClock& operator=(const FakeClock&) = delete;

  void set(std::int64_t now);
  void advance(std::int64_t seconds);
  std::int64_t now() const;
};
