// The making and the end of a pool, and the ways beside the road of a request: watched calls, first
// requests of a size class, sizes that the short rule doesn't serve, blocks of the heap.
// Test: tests/bucketmgr_test.cpp.
#include "engine/BucketMgr.h"

#include "engine/Bucket.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "services/Messages.h"
#include "services/Observers.h"
#include "services/Settings.h"
#include "services/Trace.h"

#include <algorithm>
#include <new>

namespace VOK::MemPool {

namespace {

/// Takes a record that goes back to the heap out of the checkers' sight.
void Forget(ExtRec* e) {
  Observers::RecordGone(e, e->Data(), e->length);
  Observers::BlockGone(e, sizeof(ExtRec) + e->length);
}

} // namespace

BucketMgr::BucketMgr(Mgr* mgr_, const std::string& name_)
    : name(name_), mgr(mgr_), groups(nullptr), extRecs(nullptr), numGroups(0), numExtRecs(0),
      bucketSize(std::min(Settings::bucketSize, maxBucketSize)),
      dataAlignment(std::max<std::uint32_t>(Settings::dataAlignment, 1)),
      keepEmptyBuckets(Settings::keepEmptyBuckets) {
  if (Trace::IsOn()) Trace::Constructed(this);
  enabled = !Settings::off;

  const RecSizeRange range =
      Normalise(Settings::minRecordSize, Settings::maxRecordSize, dataAlignment);
  if (range.max + recHeaderSize > bucketSize)
    Messages::Error({"Unexpected condition: ", "the maximum record size is larger than ",
                     "the bucket size (", range.max, ">", bucketSize - recHeaderSize, ") [",
                     bucketSize, "]"});
  if (range.min > range.max)
    Messages::Error({"Unexpected condition: ", "the min rec size is larger than ",
                     "the max rec size (", range.min, ">", range.max, ")"});
  maxRecSize = static_cast<std::uint32_t>(range.max);
  minRecSize = static_cast<std::uint32_t>(range.min);
  numGroups = (maxRecSize - minRecSize) / dataAlignment + 1;
  indexRule = MakeIndexRule(minRecSize, maxRecSize, dataAlignment);
  groups = new Group* [numGroups] {};
}

BucketMgr::~BucketMgr() {
  if (Trace::IsOn()) Trace::Destroyed(this);
  Clear();
  delete[] groups;
  groups = nullptr;
  numGroups = 0;
}

VOK_COLD void* BucketMgr::AllocWatched(std::uint32_t size) {
  void* const p = Observers::Present() ? AllocSeen(size) : AllocByRule(size);
  if (Trace::IsOn()) Trace::Allocated(this, p, size);
  return p;
}

VOK_COLD bool BucketMgr::FreeWatched(void* p) {
  if (Trace::IsOn()) Trace::Freed(this, p);
  const Observers::Quiet quiet(enabled);
  return FreeByRule(p);
}

// The checkers are told of an ExtRec where it is made.
void* BucketMgr::AllocSeen(std::uint32_t size) {
  const Observers::Quiet quiet(enabled);
  void* const p = AllocByRule(size);
  if (const Bucket* const bucket = FindBucket(p))
    Observers::RecordMade(bucket, p, size, bucket->recSize - recHeaderSize);
  return p;
}

VOK_COLD void* BucketMgr::AllocByRule(std::uint32_t size) {
  if (!enabled) return ::operator new[](size);
  const std::uint32_t dataSize = RoundUp(size, dataAlignment);
  if (dataSize + recHeaderSize > maxRecSize) return AllocExtRec(size);
  const std::uint32_t index = RecSizeIndex(dataSize, minRecSize, dataAlignment);
  Group*& group = groups[index];
  if (group == nullptr) {
    // Several sizes share index 0, and its records must hold the largest of them.
    const std::uint32_t held =
        index == 0 ? LargestAtIndex0(minRecSize, maxRecSize, dataAlignment) : dataSize;
    group = new Group(this, static_cast<std::uint16_t>(held));
  }
  return group->Alloc();
}

VOK_COLD void* BucketMgr::AllocExtRec(std::uint32_t size) {
  ExtRec* const e = ExtRec::Create(size);
  e->Link(extRecs, numExtRecs);
  Observers::BlockMade(e, sizeof(ExtRec) + size);
  Observers::RecordMade(e, e->Data(), size, size);
  return e->Data();
}

VOK_COLD bool BucketMgr::FreeByRule(void* p) {
  if (!enabled) {
    ::operator delete[](p);
    return true;
  }
  if (Bucket* const bucket = FindBucket(p)) return bucket->parent->Free(p, bucket);
  if (ExtRec* const e = ExtRec::FromData(p)) return FreeExtRec(e);
  return false;
}

VOK_COLD bool BucketMgr::FreeExtRec(ExtRec* e) {
  if (!e->FitsList(extRecs)) return false;
  e->Unlink(extRecs, numExtRecs);
  Forget(e);
  e->Scrub();
  ExtRec::Destroy(e);
  return true;
}

Bucket* BucketMgr::FindBucket(const void* p) const {
  if (!enabled) return nullptr;
  Bucket* const bucket = Bucket::FromData(p);
  if (bucket == nullptr) return nullptr;
  const std::uint32_t dataSize =
      RoundUp<std::uint32_t>(bucket->recSize - recHeaderSize, dataAlignment);
  const std::uint32_t index = RecSizeIndex(dataSize, minRecSize, dataAlignment);
  return index < numGroups && groups[index] == bucket->parent ? bucket : nullptr;
}

std::uint32_t BucketMgr::GetSize(const void* p) const {
  const Observers::Quiet quiet;
  if (const Bucket* const bucket = FindBucket(p)) return bucket->recSize - recHeaderSize;
  if (const ExtRec* const e = ExtRec::FromData(p)) return e->length;
  return 0;
}

bool BucketMgr::Contains(const void* p) const {
  const Observers::Quiet quiet;
  return FindBucket(p) != nullptr || ExtRec::FromData(p) != nullptr;
}

void BucketMgr::Clear() noexcept {
  const Observers::Quiet quiet;
  for (ExtRec* e = extRecs; e != nullptr;) {
    ExtRec* const next = e->next;
    Forget(e);
    ExtRec::Destroy(e);
    e = next;
  }
  extRecs = nullptr;
  numExtRecs = 0;
  for (std::uint32_t i = 0; i < numGroups; ++i) {
    if (groups[i] == nullptr) continue;
    groups[i]->Clear();
    delete groups[i];
    groups[i] = nullptr;
  }
}

std::uint32_t BucketMgr::GetNumBuckets() const {
  std::uint32_t sum = 0;
  ForEachGroup(*this, [&](const Group& group, std::uint32_t) { sum += group.numBuckets; });
  return sum;
}

} // namespace VOK::MemPool
