// A new-handler that uses the pool whose Alloc is out of memory.
#include "support/Pools.h"

#include "engine/Invariants.h"

namespace {

using namespace VOK::MemPool;

// What a new-handler does, one step after the other: a call on the whole pool, or a request of
// that many bytes. Each plan leaves Groups and buckets other than those that Alloc saw.
enum Step { reset = -3, clear = -2, freeAll = -1 };
const std::vector<int> plans[] = {{clear},           {freeAll},     {reset},
                                  {4, 8, 100, 4, 4}, {clear, 8, 4}, {reset, 8, 4}};

std::function<void()> handler;

TEST_F(Pools, NewHandlerMayUseThePoolThatIsOutOfMemory) {
  int numRuns = 0;
  for (const std::vector<int>& plan : plans)
    for (const unsigned numBefore : {0u, 2u, 4u})
      for (const int size : {4, 8, 100})
        for (const unsigned call : {1u, 2u, 3u}) {
          SCOPED_TRACE(testing::Message()
                       << numBefore << " before, size " << size << ", failing " << call);
          pools.clear();
          Mgr& pool = Make("a", "bucket=26 max=16"); // two records of 4 bytes, one of 8
          std::vector<std::uint8_t*> held = Alloc(pool, numBefore, 4);
          const auto act = [&](int step) {
            const ArenaHeap::Use real(false);
            if (step >= 0) return held.push_back(Alloc(pool, unsigned(step)));
            if (step == clear) pool.Clear();
            EXPECT_TRUE(step != reset || pool.Reset());
            for (std::uint8_t* const p : std::exchange(held, {}))
              EXPECT_TRUE(step != freeAll ||
                          (pool.Contains(p) && pool.GetSize(p) >= 4 && *p == 0x5A && pool.Free(p)));
          };
          handler = [&] { ++numRuns, std::ranges::for_each(plan, act); };
          std::set_new_handler([] { handler(); });
          heap.FailAt(call);
          act(size);
          heap.FailAt(0);
          std::set_new_handler(nullptr);
          EXPECT_TRUE(IsValid(*pool.GetBucketMgr()));
          act(plan[0] == reset ? clear : freeAll);
          EXPECT_EQ(pool.GetBucketMgr()->GetNumBuckets(), 0u);
          EXPECT_THAT(heap.faults, testing::IsEmpty());
        }
  EXPECT_GE(numRuns, 36);
}

// What a new-handler allocates counts beside the block that the heap refused.
TEST_F(Pools, NewHandlerCantPassTheLimit) {
  for (const unsigned size : {4u, 3000u}) {
    pools.push_back(std::make_unique<Mgr>("limited", Options().On().BucketSize(3000).Limit(5000)));
    handler = [&] { EXPECT_THROW(Alloc(*pools.back(), size == 4 ? 3000 : 4), std::bad_alloc); };
    std::set_new_handler([] { handler(); });
    heap.FailAt(size == 4 ? 2 : 1); // after the Group
    Alloc(*pools.back(), size);
    heap.FailAt(0);
    std::set_new_handler(nullptr);
    pools.clear();
  }
}

} // namespace
