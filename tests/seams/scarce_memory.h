// Memory that runs out on demand: SQLite's own, or what C++, JsonCpp and the C library ask for.
// Linking this seam replaces malloc() and operator new in the whole program, and SQLite's
// allocator.

#pragma once

class ScarceMemory {
 public:
  ScarceMemory() = default;
  ~ScarceMemory();
  ScarceMemory(const ScarceMemory&) = delete;
  ScarceMemory& operator=(const ScarceMemory&) = delete;

  // The n-th request from now on is refused, 1 being the next; those after it succeed.
  void refuseSqlite(int nth);
  void refuseCpp(int nth);
  // Ends the refusal; tells whether it happened.
  bool refill();

  // How often operator new has been called while the effective user was root.
  int requestsAsRoot() const;
};
