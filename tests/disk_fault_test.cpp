// The disk fails at each call in turn, or fills up. No change may be half done, and every failure
// must be reported.

#include <sqlite3.h>

#include <iostream>

#include "every_operation.h"
#include "faulty_disk.h"

namespace {

class DiskFaultTest : public EveryOperationTest {
 protected:
  void failEach(FaultyDisk::Call call, int code) {
    const int faults =
        failEverywhere([&](int nth) { FaultyDisk::fail(call, nth, code); }, FaultyDisk::mend);
    std::cout << "faults: " << faults << '\n';
  }

  const FaultyDisk disk_;
};

TEST_P(DiskFaultTest, SurvivesAFailedOpen) { failEach(FaultyDisk::Call::kOpen, SQLITE_CANTOPEN); }

TEST_P(DiskFaultTest, SurvivesAFailedRead) { failEach(FaultyDisk::Call::kRead, SQLITE_IOERR_READ); }

TEST_P(DiskFaultTest, SurvivesAFailedWrite) {
  failEach(FaultyDisk::Call::kWrite, SQLITE_IOERR_WRITE);
}

TEST_P(DiskFaultTest, SurvivesAFailedSync) {
  failEach(FaultyDisk::Call::kSync, SQLITE_IOERR_FSYNC);
}

TEST_P(DiskFaultTest, SurvivesAFailedTruncate) {
  failEach(FaultyDisk::Call::kTruncate, SQLITE_IOERR_TRUNCATE);
}

TEST_P(DiskFaultTest, SurvivesAFailedDelete) {
  failEach(FaultyDisk::Call::kDelete, SQLITE_IOERR_DELETE);
}

TEST_P(DiskFaultTest, SurvivesAFailedLock) { failEach(FaultyDisk::Call::kLock, SQLITE_IOERR_LOCK); }

TEST_P(DiskFaultTest, SurvivesALockHeldByAnother) {
  failEach(FaultyDisk::Call::kLock, SQLITE_BUSY);
}

TEST_P(DiskFaultTest, SurvivesAFullDisk) {
  const int faults =
      failEverywhere([](int nth) { FaultyDisk::fillAfter(nth - 1); }, FaultyDisk::mend);
  std::cout << "faults: " << faults << '\n';
}

INSTANTIATE_TEST_SUITE_P(Every, DiskFaultTest, testing::ValuesIn(everyOperation()), operationName);

}  // namespace
