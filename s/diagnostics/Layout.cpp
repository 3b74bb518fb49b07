// The description's values, each from the structure itself.
// Test: tests/tools/inspect_test.py.
#include "diagnostics/Layout.h"

#include "diagnostics/ReportLayout.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "engine/Rec.h"
#include "services/MgrRegistry.h"
#include "services/Settings.h"

#include <algorithm>
#include <cstddef>

namespace VOK::MemPool {

namespace {

using MgrRegistry::Entry;

static_assert(sizeof(Mgr) == sizeof(void*), "the pointer to the pool is its one field");

constexpr Structures structures{
    .entry = {.name = offsetof(Entry, name),
              .pool = offsetof(Entry, pool),
              .next = offsetof(Entry, next),
              .size = sizeof(Entry)},
    .mgr = {.bucketMgr = 0, .size = sizeof(Mgr)},
    .bucketMgr = {.mgr = offsetof(BucketMgr, mgr),
                  .groups = offsetof(BucketMgr, groups),
                  .extRecs = offsetof(BucketMgr, extRecs),
                  .numGroups = offsetof(BucketMgr, numGroups),
                  .numExtRecs = offsetof(BucketMgr, numExtRecs),
                  .bucketSize = offsetof(BucketMgr, bucketSize),
                  .dataAlignment = offsetof(BucketMgr, dataAlignment),
                  .maxRecSize = offsetof(BucketMgr, maxRecSize),
                  .minRecSize = offsetof(BucketMgr, minRecSize),
                  .enabled = offsetof(BucketMgr, enabled),
                  .size = sizeof(BucketMgr)},
    .group = {.owner = offsetof(Group, owner),
              .head1 = offsetof(Group, head1),
              .head2 = offsetof(Group, head2),
              .numBuckets = offsetof(Group, numBuckets),
              .numFreeBuckets = offsetof(Group, numFreeBuckets),
              .dataSize = offsetof(Group, dataSize),
              .size = sizeof(Group)},
    .bucket = {.parent = offsetof(Bucket, parent),
               .next1 = offsetof(Bucket, next1),
               .prev1 = offsetof(Bucket, prev1),
               .next2 = offsetof(Bucket, next2),
               .prev2 = offsetof(Bucket, prev2),
               .recsSize = offsetof(Bucket, recsSize),
               .recSize = offsetof(Bucket, recSize),
               .freeHead = offsetof(Bucket, freeHead),
               .freeRecs = offsetof(Bucket, freeRecs),
               .size = sizeof(Bucket)},
    .rec = {.offsetLow = offsetof(Rec, offsetLow),
            .offsetHigh = offsetof(Rec, offsetHigh),
            .type = offsetof(Rec, type),
            .size = sizeof(Rec)},
    .extRec = {.next = offsetof(ExtRec, next),
               .prev = offsetof(ExtRec, prev),
               .length = offsetof(ExtRec, length),
               .tag0 = offsetof(ExtRec, tag0),
               .tag1 = offsetof(ExtRec, tag1),
               .type = offsetof(ExtRec, type),
               .tag3 = offsetof(ExtRec, tag3),
               .size = sizeof(ExtRec)},
    .limits = {.maxRequest = maxRequest,
               .minBucketSize = minBucketSize,
               .maxBucketSize = maxBucketSize},
    .budget = {.held = offsetof(PoolBlock, budget) + offsetof(Budget, held),
               .peak = offsetof(PoolBlock, budget) + offsetof(Budget, peak),
               .buckets = offsetof(PoolBlock, budget) + offsetof(Budget, buckets)},
};

constexpr Layout Describe() {
  Layout made{{}, layoutFormat, sizeof(void*), &layout, &MgrRegistry::first, structures, {}};
  std::ranges::copy(layoutMagic, made.magic);
  std::ranges::copy(Settings::version, made.version);
  return made;
}

} // namespace

constinit const Layout layout = Describe();

} // namespace VOK::MemPool
