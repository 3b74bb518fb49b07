// The operations of a pool while trace is on or a memory-checking tool is present. The tools learn
// of blocks and records here and nowhere else, so that buckets, Groups and ExtRecs know of none.
// Test: tests/output_test.cpp, tests/process_test.py.
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "services/Observers.h"
#include "services/Trace.h"

#include <cstdint>
#include <utility>

namespace VOK::MemPool {

namespace {

void ReportMade(Bucket* b) {
  Observers::BlockMade(b, recsBaseOffset + b->recsSize);
  ForEachRecord(*b, [b](std::uint32_t offset) {
    Observers::Vacant(b->RecAt(offset)->Data(), b->recSize - recHeaderSize);
  });
}

void ReportGone(Bucket* b) { Observers::BlockGone(b, recsBaseOffset + b->recsSize); }

void ReportGone(ExtRec* e) {
  Observers::RecordGone(e, e->Data(), e->length);
  Observers::BlockGone(e, sizeof(ExtRec) + e->length);
}

void ReportRecordGone(Bucket* b, void* p) {
  Observers::RecordGone(b, p, b->recSize - recHeaderSize);
}

template <class Visit>
void ForEachBucket(const BucketMgr& pool, Visit visit) {
  ForEachGroup(pool, [visit](const Group& group, std::uint32_t) {
    for (Bucket* b = group.head1; b != nullptr; b = b->next1)
      visit(b);
  });
}

} // namespace

VOK_NOINLINE void* BucketMgr::AllocInstrumented(std::uint32_t size) {
  void* const p = enabled && Observers::Present() ? AllocReported(size) : AllocSlow(size);
  if (Trace::IsOn()) Trace::Allocated(this, p, size);
  return p;
}

VOK_NOINLINE bool BucketMgr::FreeInstrumented(void* p) {
  if (Trace::IsOn()) Trace::Freed(this, p);
  return enabled && Observers::Present() ? FreeReported(p) : FreeSlow(p);
}

void* BucketMgr::AllocReported(std::uint32_t size) {
  const Observers::Quiet quiet;
  const std::uint32_t dataSize = RoundUp(size, dataAlignment);
  if (dataSize + recHeaderSize > maxRecSize) {
    void* const p = AllocExtRec(size);
    auto* const e = static_cast<ExtRec*>(p) - 1;
    Observers::BlockMade(e, sizeof(ExtRec) + size);
    Observers::RecordMade(e, p, size, size);
    return p;
  }
  void* const p = AllocSlow(size);
  Bucket* const bucket = FindBucket(p);
  if (std::exchange(BudgetOf(*this).newest, nullptr) == bucket) ReportMade(bucket);
  Observers::RecordMade(bucket, p, size, bucket->recSize - recHeaderSize);
  return p;
}

// The tools come first: what is freed can be another thread's right after.
bool BucketMgr::FreeReported(void* p) {
  const Observers::Quiet quiet;
  if (Bucket* const bucket = FindBucket(p)) {
    ReportRecordGone(bucket, p);
    if (bucket->freeRecs + 1u == bucket->TotalRecs() && !keepEmptyBuckets) ReportGone(bucket);
  } else if (ExtRec* const e = FindExtRec(p)) {
    ReportGone(e);
  }
  return FreeSlow(p);
}

void BucketMgr::ReportAllFree() const {
  if (!Observers::Present()) return;
  for (ExtRec* e = extRecs; e != nullptr; e = e->next)
    ReportGone(e);
  ForEachBucket(*this, [](Bucket* b) {
    ForEachRecord(*b, [b](std::uint32_t offset) {
      if (Rec* const rec = b->RecAt(offset); rec->type == RecType::Used)
        ReportRecordGone(b, rec->Data());
    });
  });
}

void BucketMgr::ReportAllGone() const {
  if (!Observers::Present()) return;
  ReportAllFree();
  ForEachBucket(*this, [](Bucket* b) { ReportGone(b); });
}

} // namespace VOK::MemPool
