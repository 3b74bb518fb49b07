// Construction and destruction of a pool, and the slow paths of a request: the first of a size
// class, a size that the fast index doesn't reach, a block of the heap.
// Test: tests/bucketmgr_test.cpp.
#include "engine/BucketMgr.h"

#include "base/KeepStores.h"
#include "engine/Bucket.h"
#include "engine/Budget.h"
#include "engine/Checks.h"
#include "engine/ExtRec.h"
#include "engine/FastPath.h"
#include "engine/Group.h"
#include "services/HeapTop.h"
#include "services/Messages.h"
#include "services/Observers.h"
#include "services/Settings.h"
#include "services/Trace.h"

#include <algorithm>
#include <memory>
#include <new>

namespace VOK::MemPool {

BucketMgr::BucketMgr(Mgr* mgr_, const std::string& name_, const Options& options)
    : name(name_), mgr(mgr_), groups(nullptr), extRecs(nullptr), numGroups(0), numExtRecs(0),
      bucketSize(std::min(options.bucketSize.Or(Settings::bucketSize), maxBucketSize)),
      dataAlignment(std::max(options.dataAlignment.Or(Settings::dataAlignment), 1u)),
      keepEmptyBuckets(options.keepEmptyBuckets.Or(Settings::keepEmptyBuckets)) {
  if (Trace::IsOn()) Trace::Constructed(this);
  enabled = options.on.Or(!Settings::off);

  const RecSizeRange range =
      Normalise(options.minRecordSize.Or(Settings::minRecordSize),
                options.maxRecordSize.Or(Settings::maxRecordSize), dataAlignment);
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
  fastIndex = enabled ? MakeFastIndex(minRecSize, maxRecSize, dataAlignment) : noFastIndex;
  groups = new Group* [numGroups] {};
  if (enabled) HeapTop::KeepSlack();
}

BucketMgr::~BucketMgr() {
  if (Trace::IsOn()) Trace::Destroyed(this);
  Clear();
  delete[] groups;
  groups = nullptr;
  numGroups = 0;
  KeepStores(this);
}

VOK_NOINLINE void* BucketMgr::AllocSlow(std::uint32_t size) {
  if (!enabled) return ::operator new[](size);
  if (Checks* const checks = ChecksOf(*this)) return checks->Alloc(size);
  return AllocPooled(size);
}

void* BucketMgr::AllocPooled(std::uint32_t size) {
  const std::uint32_t dataSize = RoundUp(size, dataAlignment);
  if (dataSize + recHeaderSize > maxRecSize) return AllocExtRec(size);
  return GroupFor(dataSize)->Alloc();
}

VOK_NOINLINE void* BucketMgr::AllocExtRec(std::uint32_t size) {
  Budget& budget = BudgetOf(*this);
  const std::uint64_t bytes = sizeof(ExtRec) + std::uint64_t{size};
  while (!budget.Admits(bytes))
    budget.AskFor(bytes, *mgr);
  Budget::Room room(budget, bytes);
  ExtRec* const e = ExtRec::Create(size);
  room.Fill();
  e->Link(extRecs, numExtRecs);
  return e->Data();
}

VOK_NOINLINE bool BucketMgr::FreeSlow(void* p) {
  if (!enabled) {
    ::operator delete[](p);
    return true;
  }
  if (Checks* const checks = ChecksOf(*this)) return checks->Free(p);
  return FreePooled(p);
}

bool BucketMgr::FreePooled(void* p) {
  if (Bucket* const bucket = FindBucket(p)) return bucket->parent->Free(p, bucket);
  ExtRec* const e = FindExtRec(p);
  if (e == nullptr) return false;
  e->Unlink(extRecs, numExtRecs);
  BudgetOf(*this).Remove(sizeof(ExtRec) + std::uint64_t{e->length});
  e->Scrub();
  ExtRec::Destroy(e);
  return true;
}

VOK_NOINLINE bool BucketMgr::FreeLowAddress(void* p) {
  if (p == nullptr) return false;
  return Observers::Watching() ? FreeInstrumented(p) : FreeSlow(p);
}

Bucket* BucketMgr::FindBucket(const void* p) const {
  if (!enabled) return nullptr;
  Bucket* const bucket = Bucket::FromData(p);
  if (bucket == nullptr) return nullptr;
  const std::uint32_t dataSize = bucket->recSize - recHeaderSize;
  const bool isOurs =
      FastGroup(dataSize) == bucket->parent || FindGroup(dataSize) == bucket->parent;
  return isOurs ? bucket : nullptr;
}

ExtRec* BucketMgr::FindExtRec(void* p) const {
  ExtRec* const e = ExtRec::FromData(p);
  return e != nullptr && e->FitsList(extRecs) ? e : nullptr;
}

Group* BucketMgr::FindGroup(std::uint32_t size) const {
  const std::uint32_t index = RecSizeIndex(RoundUp(size, dataAlignment), minRecSize, dataAlignment);
  return index < numGroups ? groups[index] : nullptr;
}

Group* BucketMgr::GroupFor(std::uint32_t dataSize) {
  const std::uint32_t index = RecSizeIndex(dataSize, minRecSize, dataAlignment);
  if (groups[index] == nullptr) {
    // Several sizes share index 0, and its records must hold the largest of them.
    const std::uint32_t held =
        index == 0 ? LargestAtIndex0(minRecSize, maxRecSize, dataAlignment) : dataSize;
    auto made = std::make_unique<Group>(this, static_cast<std::uint16_t>(held));
    // A new-handler may have called Alloc and so made one in the meantime.
    if (groups[index] == nullptr) groups[index] = made.release();
  }
  return groups[index];
}

std::uint32_t BucketMgr::GetSize(const void* p) const {
  if (const Checks* const checks = ChecksOf(*this)) return checks->GetSize(p);
  const Observers::Quiet quiet;
  if (const Bucket* const bucket = FindBucket(p)) return bucket->recSize - recHeaderSize;
  if (const ExtRec* const e = ExtRec::FromData(p)) return e->length;
  return 0;
}

bool BucketMgr::Contains(const void* p) const {
  if (const Checks* const checks = ChecksOf(*this)) return checks->Contains(p);
  const Observers::Quiet quiet;
  return FindBucket(p) != nullptr || ExtRec::FromData(p) != nullptr;
}

void BucketMgr::Clear() noexcept {
  const Observers::Quiet quiet;
  ReportAllGone();
  const HeapTop::Plug plug(std::uint64_t{GetNumBuckets()} * bucketSize);
  ReleaseExtRecs();
  ForEachGroup(*this, [this](Group& group, std::uint32_t i) {
    group.Clear();
    delete &group;
    groups[i] = nullptr;
  });
  Budget& budget = BudgetOf(*this);
  budget.held = budget.buckets = 0;
}

bool BucketMgr::Reset() noexcept {
  if (!enabled) return false;
  const Observers::Quiet quiet;
  ReportAllFree();
  ReleaseExtRecs();
  std::uint64_t held = 0;
  ForEachGroup(*this, [&held](Group& group, std::uint32_t) {
    group.Reset();
    held += group.numBuckets * group.BlockSize();
  });
  BudgetOf(*this).held = held;
  return true;
}

void BucketMgr::ReleaseExtRecs() noexcept {
  for (ExtRec* e = extRecs; e != nullptr;) {
    ExtRec* const next = e->next;
    ExtRec::Destroy(e);
    e = next;
  }
  extRecs = nullptr;
  numExtRecs = 0;
}

std::uint32_t BucketMgr::GetNumBuckets() const {
  std::uint32_t sum = 0;
  ForEachGroup(*this, [&](const Group& group, std::uint32_t) { sum += group.numBuckets; });
  return sum;
}

} // namespace VOK::MemPool
