// A new-handler that uses the pool whose Alloc is out of memory.
#include "support/ArenaHeap.h"
#include "support/Process.h"

#include "MemPool"
#include "engine/BucketMgr.h"
#include "engine/Invariants.h"

#include <gtest/gtest.h>

#include <cstring>
#include <new>
#include <vector>

using namespace VOK::MemPool;

namespace {

// What a new-handler does, one step after the other: a call on the whole pool, or a request of
// that many bytes. Each plan leaves Groups and buckets other than those that Alloc saw.
enum Step { reset = -3, clear = -2, freeAll = -1 };
const std::vector<int> plans[] = {{clear},           {freeAll},     {reset},
                                  {4, 8, 100, 4, 4}, {clear, 8, 4}, {reset, 8, 4}};

struct Reentered {
  Mgr mgr;
  std::vector<void*> held;

  void Do(int step) {
    void* const p =
        step >= 0 ? std::memset(mgr.Alloc(unsigned(step)), 0xA5, unsigned(step)) : nullptr;
    const ArenaHeap::Use real(false);
    if (p != nullptr) return held.push_back(p);
    if (step == clear) mgr.Clear();
    EXPECT_TRUE(step != reset || mgr.Reset());
    for (void* const h : held)
      EXPECT_TRUE(step != freeAll || (mgr.Contains(h) && mgr.GetSize(h) >= 4 &&
                                      *static_cast<std::uint8_t*>(h) == 0xA5 && mgr.Free(h)));
    held.clear();
  }
};

Reentered* pool;
const std::vector<int>* plan;
int numRuns = 0;

TEST(NewHandler, MayUseThePoolThatIsOutOfMemory) {
  const KeepSettings settings{};
  Set("on=1 bucket=26 max=16"); // two records of 4 bytes, one of 8
  for (const std::vector<int>& steps : plans)
    for (const int numBefore : {0, 2, 4})
      for (const int size : {4, 8, 100})
        for (const unsigned call : {1u, 2u, 3u}) {
          SCOPED_TRACE(testing::Message()
                       << numBefore << " before, size " << size << ", failing " << call);
          ArenaHeap heap;
          const ArenaHeap::Use use;
          Reentered reentered;
          pool = &reentered;
          plan = &steps;
          for (int i = 0; i < numBefore; ++i)
            pool->Do(4);
          heap.FailAt(call);
          std::set_new_handler([] {
            ++numRuns;
            for (const int step : *plan)
              pool->Do(step);
          });
          pool->Do(size);
          std::set_new_handler(nullptr);
          heap.FailAt(0);
          EXPECT_TRUE(IsValid(*pool->mgr.GetBucketMgr()));
          pool->Do(steps[0] == reset ? clear : freeAll);
          EXPECT_EQ(pool->mgr.GetBucketMgr()->GetNumBuckets(), 0u);
          EXPECT_EQ(heap.faults, std::vector<std::string>());
        }
  EXPECT_GE(numRuns, 36);
}

} // namespace
