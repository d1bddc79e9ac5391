// Replaces the machine for the measured code: the library's fixed paths lead to a folder of this
// process, the host's cipher only copies, and the system log discards every line. Linking does
// this, in the same way for the library and for the floor.

#pragma once

#include <string>

// The number of rows in the tables.
struct Rows {
  int tokens = 0;
  int expiredTokens = 0;  // this many of the tokens have expired
  int logLines = 0;       // each has another second; the newest is a minute old
};

// The ceilings in the settings file.
inline constexpr int kRowMax = 10000, kLogMax = 1000;

// The secrets of a row. They are the same in every run.
std::string accessToken(int row);
std::string refreshToken(int row);

class Sandbox {
 public:
  Sandbox();
  ~Sandbox();
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;

  // Gives the database these rows and writes it to the disk. A database is made once for each set
  // of rows, then copied. No connection may be open.
  void layOut(const Rows& rows);
  int count(const char* table) const;

  // From now on the random device gives the same bytes each time it is opened.
  void fixEntropy();
};
