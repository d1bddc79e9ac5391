// Marks the work of a seam itself, which other seams neither count nor make fail.

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
