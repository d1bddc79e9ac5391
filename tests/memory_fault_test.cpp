// Each request for memory fails in turn. No change may be half done, every failure must be
// reported, and nothing may leak.

#include <iostream>

#include "every_operation.h"
#include "scarce_memory.h"

namespace {

class MemoryFaultTest : public EveryOperationTest {
 protected:
  void refuseEach(void (ScarceMemory::*refuse)(int nth)) {
    const int faults =
        failEverywhere([&](int nth) { (memory_.*refuse)(nth); }, [&] { return memory_.refill(); });
    EXPECT_GT(faults, 0);
    std::cout << "faults: " << faults << '\n';
  }

  ScarceMemory memory_;
};

TEST_P(MemoryFaultTest, SurvivesSqliteWithoutMemory) { refuseEach(&ScarceMemory::refuseSqlite); }

TEST_P(MemoryFaultTest, SurvivesTheLibraryWithoutMemory) { refuseEach(&ScarceMemory::refuseCpp); }

INSTANTIATE_TEST_SUITE_P(Every, MemoryFaultTest, testing::ValuesIn(everyOperation()),
                         operationName);

class PrivilegeMemoryTest : public StoreTest {};

TEST_F(PrivilegeMemoryTest, IsNotAskedForWhileIdsAreRaised) {
  ids_.become(1000, 100);
  const ScarceMemory memory;
  const int before = memory.requestsAsRoot();
  { const ZEVOOAUTHSERVER::OAUTHDBBasic store; }  // five changes of ids to open, five to close
  EXPECT_EQ(before, memory.requestsAsRoot());
  EXPECT_EQ(10U, ids_.calls().size());
}

}  // namespace
