// The fast path of a request, from the handle to the record and back. One header sees the pool, its
// Groups and its buckets, so that Mgr.cpp compiles it to straight-line code.
// Test: tests/bucketmgr_test.cpp, tests/model_test.cpp.
#ifndef VOK_MEMPOOL_FASTPATH_H
#define VOK_MEMPOOL_FASTPATH_H

#include "base/Attributes.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Group.h"
#include "services/Observers.h"

#include <cassert>
#include <cstdint>

namespace VOK::MemPool {

// Alloc and Free fall back on the slow path, which serves every case, where the fast index finds no
// Group.
VOK_ALWAYS_INLINE Group* BucketMgr::FastGroup(std::uint32_t size) const {
  const std::uint32_t index = fastIndex.IndexOf(size);
  return index < numGroups ? groups[index] : nullptr;
}

// A pool with noFastIndex, as a disabled or a checked one, needs no test here: it finds no Group.
VOK_ALWAYS_INLINE void* BucketMgr::Alloc(std::uint32_t size) {
  assert(size <= maxRequest);
  if (Observers::Watching()) [[unlikely]]
    return AllocInstrumented(size);
  Group* const group = FastGroup(size);
  if (group == nullptr) [[unlikely]]
    return AllocSlow(size);
  return group->Alloc();
}

/// From a pointer above this address no offset leads to a bucket at address 0. So one compare
/// makes two tests: of the pointer, and of the bucket that its header leads to.
inline constexpr std::uintptr_t lowestAddress = maxBucketSize + recsBaseOffset + sizeof(Rec);

// The Group that the pool has for the bucket's record size is the bucket's parent if the bucket is
// this pool's. Where a released bucket was, that pointer can be anything: it is compared and never
// followed.
VOK_ALWAYS_INLINE bool BucketMgr::Free(void* p) {
  if (reinterpret_cast<std::uintptr_t>(p) <= lowestAddress) [[unlikely]]
    return FreeLowAddress(p);
  if (Observers::Watching()) [[unlikely]]
    return FreeInstrumented(p);
  // Such a pool reads nothing before the pointer: the bytes can be the heap's, or nobody's.
  if (fastIndex.shift == noFastIndex.shift) [[unlikely]]
    return FreeSlow(p);
  const Rec* const rec = Rec::FromData(p);
  if (rec->type != RecType::Used || rec->Offset() < 2) [[unlikely]]
    return FreeSlow(p);
  Bucket* const bucket = Bucket::OfUsed(rec);
  Group* const group = FastGroup(bucket->recSize - recHeaderSize);
  if (group == nullptr || group != bucket->parent || bucket->recsSize == 0) [[unlikely]]
    return FreeSlow(p);
  return group->TakeBack(p, bucket);
}

} // namespace VOK::MemPool

#endif
