// Calls that come at an unusual time: a new-handler that uses the pool whose Alloc is out of
// memory, and a handle's destructor that runs twice.
#include "support/ArenaHeap.h"

#include "MemPool"
#include "engine/BucketMgr.h"
#include "engine/Invariants.h"

#include <gtest/gtest.h>

#include <cstring>
#include <new>
#include <vector>

using namespace VOK::MemPool;

namespace {

Mgr* pool;
std::vector<void*> held;
unsigned numRuns;

void Take(unsigned size) {
  void* const p = std::memset(pool->Alloc(size), 0xA5, size);
  const ArenaHeap::Use real(false);
  held.push_back(p);
}

void FreeAll() {
  for (void* const p : held)
    EXPECT_TRUE(pool->Contains(p) && pool->GetSize(p) >= 4 && pool->Free(p));
  held.clear();
}

void ClearAll() {
  pool->Clear();
  held.clear();
}

// The new-handlers: each leaves Groups and buckets other than those that Alloc saw.
const std::new_handler handlers[] = {
    [] {
      ++numRuns;
      ClearAll();
    },
    [] {
      ++numRuns;
      FreeAll();
    },
    [] {
      ++numRuns;
      for (const unsigned size : {4u, 8u, 100u, 4u, 4u})
        Take(size);
    },
    [] {
      ++numRuns;
      ClearAll();
      Take(8);
      Take(4);
    },
};

TEST(NewHandler, MayUseThePoolThatIsOutOfMemory) {
  const bool on = ZOR_VOK_MEMPOOL_ON();
  const unsigned bucketSize = ZOR_VOK_MEMPOOL_BUCKET_SIZE(),
                 max = ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE();
  ZOR_VOK_MEMPOOL_ON(true);
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(26); // two records of 4 bytes, one of 8
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(16);
  numRuns = 0;
  for (const std::new_handler handler : handlers)
    for (const unsigned numBefore : {0u, 2u, 4u})
      for (const unsigned size : {4u, 8u, 100u})
        for (const unsigned call : {1u, 2u, 3u}) {
          SCOPED_TRACE(testing::Message()
                       << numBefore << " before, size " << size << ", failing " << call);
          ArenaHeap heap;
          const ArenaHeap::Use use;
          Mgr mgr("reentered");
          pool = &mgr;
          for (unsigned i = 0; i < numBefore; ++i)
            Take(4);
          std::set_new_handler(handler);
          heap.FailAt(call);
          Take(size);
          heap.FailAt(0);
          std::set_new_handler(nullptr);
          EXPECT_TRUE(IsValid(*mgr.GetBucketMgr()));
          FreeAll();
          EXPECT_EQ(mgr.GetBucketMgr()->GetNumBuckets(), 0u);
          EXPECT_EQ(heap.faults, std::vector<std::string>());
        }
  EXPECT_GE(numRuns, 36u);
  ZOR_VOK_MEMPOOL_ON(on);
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(bucketSize);
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(max);
}

TEST(Handle, DestroyedTwiceIsDestroyedOnce) {
  alignas(Mgr) unsigned char place[sizeof(Mgr)];
  auto* const mgr = new (place) Mgr("twice");
  mgr->~Mgr();
  EXPECT_EQ(mgr->GetBucketMgr(), nullptr);
  mgr->~Mgr();
  EXPECT_EQ(GetMgr("twice"), nullptr);
}

} // namespace
