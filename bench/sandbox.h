// The machine as the measured code sees it: the library's fixed paths lead into a folder of this
// process, the host's cipher copies, and the system log swallows what it is told. All of it by
// linking, the same for the library and for the floor.

#pragma once

#include <string>

// What the tables hold.
struct Rows {
  int tokens = 0;
  int expiredTokens = 0;  // so many of them
  int logLines = 0;       // each of another second, the newest a minute old
};

// The ceilings in the settings file.
inline constexpr int kRowMax = 10000, kLogMax = 1000;

// Secrets in the order of their rows: the same in every run.
std::string accessToken(int row);
std::string refreshToken(int row);

class Sandbox {
 public:
  Sandbox();
  ~Sandbox();
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;

  // Makes the database hold these rows, written to the disk: a copy of one that is made once. No
  // connection may be open.
  void layOut(const Rows& rows);
  int count(const char* table) const;

  // From now on the device of entropy gives the same bytes at every opening.
  void fixEntropy();
};
