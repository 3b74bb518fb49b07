// Each walk restates the equations above the struct, and no more.
// Test: tests/model_test.cpp.
#include "engine/Invariants.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "services/Observers.h"

#include <cstdint>

namespace VOK::MemPool {

namespace {

bool IsRecordOf(const Bucket& bucket, std::uint32_t offset) {
  return offset >= 2 && offset < bucket.recsSize && (offset - 2) % bucket.recSize == 0;
}

// The chain ends after freeRecs records, so a circle fails too.
bool FreeListIsValid(const Bucket& bucket) {
  std::uint32_t offset = bucket.freeHead;
  for (std::uint32_t i = 0; i < bucket.freeRecs; ++i) {
    if (!IsRecordOf(bucket, offset)) return false;
    const Rec* const rec = bucket.RecAt(offset);
    if (rec->type != RecType::Free) return false;
    offset = rec->Offset();
  }
  return offset == 0;
}

bool UsedRecsAreValid(const Bucket& bucket) {
  std::uint32_t used = 0;
  bool areUsed = true;
  ForEachRecord(bucket, [&](std::uint32_t offset) {
    const Rec* const rec = bucket.RecAt(offset);
    if (rec->type == RecType::Free) return;
    areUsed = areUsed && rec->type == RecType::Used && rec->Offset() == offset;
    ++used;
  });
  return areUsed && used == bucket.TotalRecs() - bucket.freeRecs;
}

// Adds the bytes of their blocks to `held`.
bool ExtRecsAreValid(const BucketMgr& pool, std::uint64_t& held) {
  std::uint32_t count = 0;
  const ExtRec* prev = nullptr;
  for (const ExtRec* e = pool.extRecs; e != nullptr; prev = e, e = e->next) {
    if (e->prev != prev || e->tag0 != 0xAA || e->tag1 != 0xBB || e->type != RecType::Ext ||
        e->tag3 != 0xCC || ++count > pool.numExtRecs)
      return false;
    held += sizeof(ExtRec) + std::uint64_t{e->length};
  }
  return count == pool.numExtRecs;
}

} // namespace

bool IsValid(const Bucket& bucket) {
  const Observers::Quiet quiet;
  if (bucket.recSize == 0) return false;
  const std::uint32_t totalRecs = bucket.TotalRecs();
  return totalRecs >= 1 && 2 + totalRecs * bucket.recSize == bucket.recsSize &&
         (bucket.freeHead == 0) == (bucket.freeRecs == 0) && FreeListIsValid(bucket) &&
         UsedRecsAreValid(bucket);
}

bool IsValid(const Group& group) {
  const Observers::Quiet quiet;
  std::uint32_t withFree = 0;
  std::uint32_t count = 0;
  const Bucket* prev = nullptr;
  for (const Bucket* b = group.head1; b != nullptr; prev = b, b = b->next1) {
    if (b->prev1 != prev || b->parent != &group || ++count > group.numBuckets) return false;
    if (b->recSize != group.dataSize + recHeaderSize || b->TotalRecs() != group.totalRecs ||
        b->recsSize > group.owner->bucketSize || !IsValid(*b))
      return false;
    if (b->freeRecs > 0) ++withFree;
  }
  if (count != group.numBuckets || prev != group.tail1) return false;

  count = 0;
  prev = nullptr;
  for (const Bucket* b = group.head2; b != nullptr; prev = b, b = b->next2)
    if (b->prev2 != prev || b->freeRecs == 0 || ++count > group.numFreeBuckets) return false;
  return count == group.numFreeBuckets && count == withFree;
}

bool IsValid(const BucketMgr& pool) {
  const Observers::Quiet quiet;
  if (pool.minRecSize > pool.maxRecSize || pool.maxRecSize + recHeaderSize > pool.bucketSize ||
      pool.minRecSize % pool.dataAlignment != 0 || pool.maxRecSize % pool.dataAlignment != 0 ||
      pool.numGroups != (pool.maxRecSize - pool.minRecSize) / pool.dataAlignment + 1)
    return false;
  bool groupsAreValid = true;
  std::uint64_t buckets = 0;
  std::uint64_t held = 0;
  ForEachGroup(pool, [&](const Group& group, std::uint32_t i) {
    groupsAreValid = groupsAreValid && pool.enabled && group.owner == &pool && IsValid(group) &&
                     RecSizeIndex(group.dataSize, pool.minRecSize, pool.dataAlignment) == i;
    buckets += group.numBuckets;
    held += group.numBuckets * group.BlockSize();
  });
  return groupsAreValid && ExtRecsAreValid(pool, held) &&
         (pool.enabled || pool.extRecs == nullptr) && BudgetOf(pool).buckets == buckets &&
         BudgetOf(pool).held == held;
}

} // namespace VOK::MemPool
