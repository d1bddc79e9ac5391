// The process's effective ids. Linking this seam replaces the id calls in the whole program;
// without an object they answer root and refuse every change.

#pragma once

#include <string>
#include <vector>

class FakeIds {
 public:
  // Starts as root, which is allowed everything.
  FakeIds();
  ~FakeIds();
  FakeIds(const FakeIds&) = delete;
  FakeIds& operator=(const FakeIds&) = delete;

  void become(unsigned user, unsigned group);
  // Fails the call of this form with the errno given: "setresgid(-1, 0, -1)".
  void refuse(const std::string& call, int error);
  // Every call that changes ids, refused or not: "setresuid(-1, 1000, -1)".
  const std::vector<std::string>& calls() const;
  unsigned user() const;
  unsigned group() const;
};
