#include "support/Pools.h"

#include "services/MgrRegistry.h"

namespace {

using namespace VOK::MemPool;

// A number is never used again: not after its pool is gone, nor where the pool ran out of memory,
// at whichever of its allocations, and then nothing is left of it.
TEST_F(Pools, AutomaticNames) {
  const std::locale before = std::locale::global(Grouping());
  unsigned long number = std::stoul(MgrRegistry::NextAutomaticName().substr(14));
  const auto expectNext = [&](const std::string& name) {
    char expected[40];
    std::snprintf(expected, sizeof expected, "__VOK_MEMPOOL_%05lu", ++number);
    EXPECT_EQ(name, expected);
  };
  unsigned k = 0;
  for (bool done = false; !done;) {
    heap.FailAt(++k);
    try {
      const ArenaHeap::Use use;
      const Mgr first;
      const Mgr named("named");
      done = true;
      const ArenaHeap::Use real(false);
      heap.FailAt(0);
      expectNext(first.GetName());
    } catch (const std::bad_alloc&) {
      ++number;
    }
    EXPECT_THAT(heap.Finish(), testing::IsEmpty());
    EXPECT_EQ(GetNumMgrs(), 0u);
  }
  EXPECT_GT(k, 8u);
  expectNext(Mgr().GetName());
  while (number < 100010)
    expectNext(MgrRegistry::NextAutomaticName());
  std::locale::global(before);
}

} // namespace
