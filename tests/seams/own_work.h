// Marks what a seam does by itself: the library must not be blamed, nor made to fail, for it.

#pragma once

class OwnWork {
 public:
  OwnWork() { ++depth; }
  ~OwnWork() { --depth; }
  OwnWork(const OwnWork&) = delete;
  OwnWork& operator=(const OwnWork&) = delete;

  static bool isUnderWay() { return depth > 0; }

 private:
  static inline thread_local int depth = 0;
};
