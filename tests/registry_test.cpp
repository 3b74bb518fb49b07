#include "support/Pools.h"

#include "services/MgrRegistry.h"

namespace {

unsigned long NextNumber() { return std::stoul(MgrRegistry::NextAutomaticName().substr(14)); }

// A number never comes again: not after its pool is gone, nor where the pool ran out of memory, at
// whichever of its allocations, and then nothing is left of it.
TEST_F(Pools, AutomaticNames) {
  unsigned long number = NextNumber();
  const auto nextName = [&number] {
    return "__VOK_MEMPOOL_" + std::to_string(++number + 100000).substr(1);
  };
  unsigned numFailed = 0;
  for (bool done = false; !done; ++numFailed) {
    heap.FailAt(numFailed + 1);
    try {
      const ArenaHeap::Use use;
      const Mgr first;
      const Mgr named("named");
      done = true;
      const ArenaHeap::Use real(false);
      heap.FailAt(0);
      EXPECT_EQ(first.GetName(), nextName());
    } catch (const std::bad_alloc&) {
      ++number;
    }
    EXPECT_THAT(heap.Finish(), testing::IsEmpty());
    EXPECT_EQ(GetNumMgrs(), 0u);
  }
  EXPECT_GT(numFailed, 8u);
  EXPECT_EQ(Mgr().GetName(), nextName());

  const GroupingLocale locale;
  while (NextNumber() < 99998) {
  }
  EXPECT_EQ(MgrRegistry::NextAutomaticName(), "__VOK_MEMPOOL_99999");
  EXPECT_EQ(MgrRegistry::NextAutomaticName(), "__VOK_MEMPOOL_100000");
}

TEST(Registry, AssignedHandle) {
  Mgr a("a");
  Mgr b("b");
  BucketMgr* const poolOfA = a.GetBucketMgr();
  EXPECT_EQ(&(a = b), &a);
  EXPECT_EQ(a.GetBucketMgr(), b.GetBucketMgr());
  EXPECT_STREQ(a.GetName(), "b");
  EXPECT_TRUE(GetMgr("a") == &a && GetMgr("b") == &b && GetNumMgrs() == 2);
  EXPECT_TRUE(poolOfA->mgr == &a && b.GetBucketMgr()->mgr == &b && poolOfA->name == "a");
  std::memcpy(static_cast<void*>(&a), &poolOfA, sizeof a); // so that both can end
}

} // namespace
