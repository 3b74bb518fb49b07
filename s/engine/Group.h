// One size class of one pool: its buckets on two lists, all of them and those with a free record.
// It decides which bucket serves, when one is made and when one returns to the heap.
// Test: tests/model_test.cpp.
#ifndef VOK_MEMPOOL_GROUP_H
#define VOK_MEMPOOL_GROUP_H

#include "base/Attributes.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"

#include <cstdint>

namespace VOK::MemPool {

/// Both lists put new entries at the head.
/// - a bucket is on the first list from its creation to its release
/// - a bucket is on the second list exactly while it has a free record
/// - numBuckets and numFreeBuckets are the lists' lengths, so numFreeBuckets == 0 exactly when
///   head2 is null
struct Group {
  BucketMgr* const owner;           ///< the pool
  Bucket* head1 = nullptr;          ///< newest of all buckets
  Bucket* tail1 = nullptr;          ///< oldest of all buckets
  Bucket* head2 = nullptr;          ///< the bucket that serves the next request
  std::uint32_t numBuckets = 0;     ///< length of the first list
  std::uint32_t numFreeBuckets = 0; ///< length of the second list
  const std::uint16_t dataSize;     ///< data bytes of each record
  const std::uint16_t totalRecs;    ///< derived: records of each bucket, to spare Free a division

  Group(BucketMgr* owner, std::uint16_t dataSize);

  /// The data pointer of a used record, never null; the heap's exception passes through.
  void* Alloc();

  /// Frees the record of data pointer `p`. `bucket` is the one that holds it, or null to have it
  /// looked up. False, with nothing changed, if the look-up finds none or the bucket is not this
  /// Group's. REQUIRES, where `bucket` is given: `p` is a used record of it.
  bool Free(void* p, Bucket* bucket);

  /// Free, for a caller that has made its tests. Always true.
  /// REQUIRES: `p` is a used record of `bucket`, whose parent is this Group.
  bool TakeBack(void* p, Bucket* bucket);

  /// The bytes of each bucket's heap block.
  std::uint64_t BlockSize() const {
    return recsBaseOffset + 2 + std::uint64_t{totalRecs} * (dataSize + recHeaderSize);
  }

  /// Releases all buckets, in whatever state they are.
  void Clear() noexcept;

  /// Makes every bucket as new, whatever its header says of its records, and the second list equal
  /// to the first.
  void Reset() noexcept;

  /// Puts `b` at the head of the second list. Its `prev2` is null already: a bucket only ever
  /// leaves that list alive from its head.
  void LinkFree(Bucket* b);

  /// Takes `b` out of the second list. Its own links stay as they are.
  void UnlinkFree(Bucket* b);

  /// Takes `b` out of the first list.
  void UnlinkAll(Bucket* b);

private:
  void* AllocFromNewBucket();
  void Link(Bucket* b);
  void* UnlinkFull(Bucket* b, void* p);
  bool LinkRefilled(Bucket* b);
  bool ReleaseEmptied(Bucket* b);
};

static_assert(sizeof(Group) <= 4 * sizeof(void*) + 2 * 4 + 2 * 2 + (sizeof(void*) - 4),
              "the count of records fills what alignment leaves");

/// Calls `visit` with each Group of the pool and its index, in the order of the table.
template <class Visit>
void ForEachGroup(const BucketMgr& pool, Visit visit) {
  for (std::uint32_t i = 0; i < pool.numGroups; ++i)
    if (Group* const group = pool.groups[i]) visit(*group, i);
}

// The head of the second list is tested in place of its count, since it is needed next.
VOK_ALWAYS_INLINE void* Group::Alloc() {
  Bucket* const b = head2;
  if (b == nullptr) [[unlikely]]
    return AllocFromNewBucket();
  void* const p = b->PopRec();
  if (b->freeRecs == 0) [[unlikely]]
    return UnlinkFull(b, p);
  return p;
}

VOK_ALWAYS_INLINE bool Group::TakeBack(void* p, Bucket* bucket) {
  bucket->PushRec(p);
  const std::uint16_t freeRecs = bucket->freeRecs;
  if (freeRecs == totalRecs) [[unlikely]]
    return ReleaseEmptied(bucket);
  if (freeRecs == 1) [[unlikely]]
    return LinkRefilled(bucket);
  return true;
}

} // namespace VOK::MemPool

#endif
