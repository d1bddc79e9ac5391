// The file system below SQLite, which fails or kills the process on demand. An object of this class
// is SQLite's default file system while it lives. It does not pass syncs on: thousands of faults
// would wait for the disk, and no test needs its files after a power failure.

#pragma once

class FaultyDisk {
 public:
  enum class Call { kOpen, kRead, kWrite, kSync, kTruncate, kDelete, kLock };

  FaultyDisk();
  ~FaultyDisk();
  FaultyDisk(const FaultyDisk&) = delete;
  FaultyDisk& operator=(const FaultyDisk&) = delete;

  // The n-th such call from now on returns this SQLite code, 1 being the next. Replaces an earlier
  // fault.
  static void fail(Call call, int nth, int code);
  // The disk is full after so many more writes.
  static void fillAfter(int writes);
  // The disk is full when a rollback journal has this many bytes.
  static void limitJournal(int bytes);
  // The n-th call that changes a file (write, sync, truncate, delete) kills the process: a write
  // after half of its bytes, the others before they begin.
  static void killAt(int nth);
  // Ends the fault; tells whether it happened.
  static bool mend();
};
