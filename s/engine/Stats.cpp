// The figures of a pool as data, from the headers of its buckets, and the walk of its records.
// Test: tests/options_test.cpp.
#include "MemPool"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "services/Observers.h"

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool {

namespace {

/// A field of a header, which is inaccessible to the program.
template <class Field>
Field Quietly(const Field& field) {
  const Observers::Quiet quiet;
  return field;
}

SizeClass FiguresOf(const Group& group) {
  SizeClass figures{};
  figures.dataSize = group.dataSize;
  figures.buckets = group.numBuckets;
  for (const Bucket* b = group.head1; b != nullptr; b = b->next1) {
    figures.usedRecords += std::size_t{group.totalRecs} - b->freeRecs;
    figures.freeRecords += b->freeRecs;
    if (b->freeRecs == group.totalRecs) ++figures.emptyBuckets;
    if (b->freeRecs == 0) ++figures.fullBuckets;
  }
  return figures;
}

} // namespace

Stats Mgr::GetStats() const {
  const Observers::Quiet quiet;
  Stats stats{};
  ForEachGroup(*bucketMgr, [&](const Group& group, std::uint32_t) {
    const SizeClass figures = FiguresOf(group);
    stats.usedRecords += figures.usedRecords;
    stats.freeRecords += figures.freeRecords;
    stats.buckets += figures.buckets;
    stats.emptyBuckets += figures.emptyBuckets;
    stats.fullBuckets += figures.fullBuckets;
    stats.payload += figures.usedRecords * figures.dataSize;
  });
  for (const ExtRec* e = bucketMgr->extRecs; e != nullptr; e = e->next)
    stats.payload += e->length;
  stats.largeRecords = bucketMgr->numExtRecs;
  stats.bytesHeld = static_cast<std::size_t>(BudgetOf(*bucketMgr).held);
  stats.peakBytesHeld = static_cast<std::size_t>(BudgetOf(*bucketMgr).peak);
  return stats;
}

std::vector<SizeClass> Mgr::GetSizeClasses() const {
  const Observers::Quiet quiet;
  std::vector<SizeClass> classes;
  ForEachGroup(*bucketMgr,
               [&](const Group& group, std::uint32_t) { classes.push_back(FiguresOf(group)); });
  return classes;
}

// Memcheck still reports errors in the program's function.
void Mgr::VisitRecords(void (*visit)(void* context, void* data, unsigned size),
                       void* context) const {
  const auto show = [&](void* data, std::uint32_t size) {
    const Checks* const checks = ChecksOf(*bucketMgr);
    if (checks == nullptr)
      visit(context, data, size);
    else if (checks->Contains(data))
      visit(context, data, checks->GetSize(data));
  };
  ForEachGroup(*bucketMgr, [&](const Group& group, std::uint32_t) {
    const std::uint32_t stride = group.dataSize + recHeaderSize;
    for (Bucket* b = group.head1; b != nullptr; b = b->next1)
      for (std::uint32_t i = 0; i < group.totalRecs; ++i)
        if (Rec* const rec = b->RecAt(2 + i * stride); Quietly(rec->type) == RecType::Used)
          show(rec->Data(), group.dataSize);
  });
  for (ExtRec* e = bucketMgr->extRecs; e != nullptr; e = e->next)
    show(e->Data(), Quietly(e->length));
}

} // namespace VOK::MemPool
