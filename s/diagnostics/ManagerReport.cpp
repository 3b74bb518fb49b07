// The report of a pool: one walk for its figures, the header block, then the histogram and the
// tables, and in the detailed form the report of each bucket. The four entry points are at the end.
// Test: tests/report_test.cpp.
#include "MemPool"

#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "diagnostics/SizeFreqMap.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "engine/Rec.h"
#include "services/MgrRegistry.h"
#include "services/Observers.h"
#include "services/Output.h"

#include <cstdint>
#include <ostream>
#include <string>

namespace VOK::MemPool {

namespace {

struct Figures {
  std::uint32_t usedRecs = 0;
  std::uint32_t freeRecs = 0;
  std::uint32_t emptyBuckets = 0; ///< nothing in them is in use
  std::uint32_t fullBuckets = 0;  ///< nothing in them is free
  std::uint32_t freeBucks = 0;    ///< buckets with at least one free record
  std::uint32_t freeBucksM = 0;   ///< data size of the last group in the order of the table
  SizeFreqMap usedSizes;

  void Add(const Bucket& bucket) {
    const std::uint32_t totalRecs = bucket.TotalRecs();
    usedRecs += totalRecs - bucket.freeRecs;
    freeRecs += bucket.freeRecs;
    bucket.CollectUsedSizes(usedSizes);
    if (bucket.freeRecs == totalRecs) ++emptyBuckets;
    if (bucket.freeRecs == 0) ++fullBuckets;
  }

  void Add(const Group& group) {
    for (const Bucket* b = group.head1; b != nullptr; b = b->next1)
      Add(*b);
    freeBucks += group.numFreeBuckets;
    freeBucksM = group.dataSize;
  }

  explicit Figures(const BucketMgr& pool) {
    ForEachGroup(pool, [this](const Group& group, std::uint32_t) { Add(group); });
    for (const ExtRec* e = pool.extRecs; e != nullptr; e = e->next)
      usedSizes.Count(e->length, 1);
  }
};

void WriteHeader(std::ostream& os, std::uint32_t depth, const BucketMgr& pool,
                 const Figures& figures) {
  os << Indent(depth) << PoolTitle::pool << pool.name << std::endl;
  const std::string indent = Indent(depth + 1);
  HeaderText(os, indent, PoolLabel::version, GetVersion());
  HeaderText(os, indent, PoolLabel::addr, PtrText(&pool));
  HeaderNumber(os, indent, PoolLabel::sizeofPool, sizeof(BucketMgr));
  HeaderNumber(os, indent, PoolLabel::bucketSize, pool.bucketSize);
  HeaderNumber(os, indent, PoolLabel::numGroups, pool.numGroups);
  HeaderNumber(os, indent, PoolLabel::numBuckets, pool.GetNumBuckets());
  HeaderNumber(os, indent, PoolLabel::empty, figures.emptyBuckets);
  HeaderNumber(os, indent, PoolLabel::full, figures.fullBuckets);
  HeaderNumber(os, indent, PoolLabel::usedRecs, figures.usedRecs);
  HeaderNumber(os, indent, PoolLabel::extRecs, pool.numExtRecs);
  HeaderNumber(os, indent, PoolLabel::freeRecs, figures.freeRecs);
  HeaderNumber(os, indent, PoolLabel::freeBucks, figures.freeBucks);
  HeaderNumber(os, indent, PoolLabel::freeBucksM, figures.freeBucksM);
  HeaderNumber(os, indent, PoolLabel::enabled, pool.enabled);
  HeaderNumber(os, indent, PoolLabel::maxExtSize, maxRequest);
  HeaderNumber(os, indent, PoolLabel::minBucketSize, minBucketSize);
  HeaderNumber(os, indent, PoolLabel::maxBucketSize, maxBucketSize);
  HeaderNumber(os, indent, PoolLabel::minRecSize, pool.minRecSize);
  HeaderNumber(os, indent, PoolLabel::maxRecSize, pool.maxRecSize);
  HeaderNumber(os, indent, PoolLabel::dataAlignment, pool.dataAlignment);
  HeaderNumber(os, indent, PoolLabel::sizeofBucket, sizeof(Bucket));
  HeaderNumber(os, indent, PoolLabel::sizeofHeader, sizeof(Rec));
  HeaderNumber(os, indent, PoolLabel::sizeofFree, sizeof(Rec));
  HeaderNumber(os, indent, PoolLabel::sizeofUsed, sizeof(Rec));
}

void Report(const Mgr& mgr, std::ostream& os, bool detailed) {
  mgr.GetBucketMgr()->Dbg(os, 0, detailed, detailed, detailed);
}

// Through the handle that built the pool, which may hold another one by now.
void ReportAll(std::ostream& os, bool detailed) {
  for (const Mgr* const mgr : MgrRegistry::Handles())
    Report(*mgr, os, detailed);
}

} // namespace

void BucketMgr::Dbg(std::ostream& os, std::uint32_t depth, bool detailed, bool showRecs,
                    bool showFreeList) const {
  const Observers::Quiet quiet;
  const Figures figures(*this);
  WriteHeader(os, depth, *this, figures);
  DbgHistogram(os, depth + 2, figures.usedSizes);
  DbgBuckets(os, depth);
  DbgFreeBuckets(os, depth, figures.freeBucks, figures.freeBucksM);
  DbgExtRecs(os, depth);
  if (!detailed) return;

  std::uint32_t number = 0;
  ForEachGroup(*this, [&](const Group& group, std::uint32_t) {
    for (const Bucket* b = group.head1; b != nullptr; b = b->next1)
      b->Dbg(os, ++number, depth + 1, showRecs, showFreeList);
  });
}

void Mgr::Dbg() const { Report(*this, StandardOutput(), false); }
void Mgr::Dbg(std::ostream& os) const { Report(*this, os, false); }

void Mgr::DbgDetailed() const { Report(*this, StandardOutput(), true); }
void Mgr::DbgDetailed(std::ostream& os) const { Report(*this, os, true); }

void Dbg() { ReportAll(StandardOutput(), false); }
void Dbg(std::ostream& os) { ReportAll(os, false); }

void DbgDetailed() { ReportAll(StandardOutput(), true); }
void DbgDetailed(std::ostream& os) { ReportAll(os, true); }

} // namespace VOK::MemPool
