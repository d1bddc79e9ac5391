// The file system below SQLite, which fails or kills the process on demand. An object of this class
// is SQLite's default file system while it lives. It passes no sync on: nothing here needs a file
// to survive the machine, and thousands of faults would wait for the disk.

#pragma once

class FaultyDisk {
 public:
  enum class Call { kOpen, kRead, kWrite, kSync, kTruncate, kDelete, kLock };

  FaultyDisk();
  ~FaultyDisk();
  FaultyDisk(const FaultyDisk&) = delete;
  FaultyDisk& operator=(const FaultyDisk&) = delete;

  // The n-th such call from now on answers this SQLite code, 1 being the next. Replaces whatever
  // was asked for before.
  static void fail(Call call, int nth, int code);
  // Only so many more writes succeed; then the disk is full.
  static void fillAfter(int writes);
  // A rollback journal may grow to this many bytes; then the disk is full.
  static void limitJournal(int bytes);
  // The n-th call that changes a file (write, sync, truncate, delete) kills the process: a write
  // when half of it is done, the others before they begin.
  static void killAt(int nth);
  // Back to working order; tells whether the fault came.
  static bool mend();
};
