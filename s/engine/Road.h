// The road of a request, from the handle to the record and back. It stands in one header that sees
// the pool, its groups and its buckets, so that Mgr.cpp compiles it to one straight piece.
// Test: tests/bucketmgr_test.cpp, tests/model_test.cpp.
#ifndef VOK_MEMPOOL_ROAD_H
#define VOK_MEMPOOL_ROAD_H

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Group.h"
#include "engine/HotCold.h"
#include "services/Observers.h"

#include <cassert>

namespace VOK::MemPool {

// Both operations fall back on the written rule, which needs divisions and serves every case, where
// the short one doesn't reach.

// A disabled pool needs no test here: all entries of its table are null.
VOK_HOT void* BucketMgr::Alloc(std::uint32_t size) {
  assert(size <= maxRequest);
  if (Observers::Watching()) [[unlikely]]
    return AllocWatched(size);
  const std::uint32_t index = indexRule.IndexOf(size);
  if (index >= numGroups) [[unlikely]]
    return AllocByRule(size);
  Group* const group = groups[index];
  if (group == nullptr) [[unlikely]]
    return AllocByRule(size);
  return group->Alloc();
}

// The owner is told by the table's entry for the bucket's record size, which is the bucket's parent
// if it is this pool's. Where a released bucket lay, that pointer can be anything: it is compared
// and never followed.
VOK_HOT bool BucketMgr::Free(void* p) {
  if (p == nullptr) return false;
  if (Observers::Watching()) [[unlikely]]
    return FreeWatched(p);
  if (!enabled) [[unlikely]]
    return FreeByRule(p);
  const Rec* const rec = Rec::FromData(p);
  if (rec->type != RecType::Used || rec->Offset() < 2) [[unlikely]]
    return FreeByRule(p);
  Bucket* const bucket = Bucket::OfUsed(rec);
  const std::uint32_t index = indexRule.IndexOf(bucket->recSize - recHeaderSize);
  if (index >= numGroups) [[unlikely]]
    return FreeByRule(p);
  Group* const group = groups[index];
  if (group == nullptr || group != bucket->parent) [[unlikely]]
    return FreeByRule(p);
  return group->TakeBack(p, bucket);
}

} // namespace VOK::MemPool

#endif
