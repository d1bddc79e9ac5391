// The fixed paths of the library, redirected to a fresh directory, and the system's random bytes.
// Linking this seam replaces sqlite3_open(), open(), lstat() and access() for those paths, and
// getrandom(), in the whole program; a program that makes no object of this class gets a directory
// of its own at first use.

#pragma once

#include <string>
#include <vector>

class RedirectedFiles {
 public:
  // Makes an empty directory; the destructor removes it with all it holds.
  RedirectedFiles();
  // Uses a directory that exists, and leaves it there.
  explicit RedirectedFiles(const std::string& directory);
  ~RedirectedFiles();
  RedirectedFiles(const RedirectedFiles&) = delete;
  RedirectedFiles& operator=(const RedirectedFiles&) = delete;

  std::string directory() const;
  std::string database() const;
  std::string settings() const;
  std::string debugMarker() const;

  // Makes opening the database fail as in a missing directory.
  void removeDirectory();
  // Opens the database for reading only, and does not create it.
  void openReadOnly();
  // The next lstat() fails with this errno.
  void failNextLook(int error);
  // sqlite3_open() returns this code and no handle, as it does without memory.
  void openWithoutHandle(int code);
  // Waits for locks of other processes as long as the library asks for.
  void waitForLocks();
  // sqlite3_close() closes, but returns this code.
  void failClose(int code);
  // getrandom() fails with this errno after so many calls: ENOSYS is a kernel without the call.
  void failRandomCall(int error, int calls = 0);
  // getrandom() is interrupted every other time, and delivers 5 bytes at most: 1, 2, 3 and so on.
  void trickleRandomBytes();
  // The device of random bytes cannot be opened.
  void removeRandomDevice();
  // sqlite3_mprintf() finds no memory.
  void failFormatting();

  // Every call of the library that opens or closes: "open <path>", "busy_timeout 5000",
  // "close".
  const std::vector<std::string>& calls() const;
};
