// The report of a pool: one walk for its figures, the header block, then the histogram and the
// tables, and in the detailed form the report of each bucket. The four entry points stand below.
// Test: tests/report_test.cpp.
#include "MemPool"

#include "diagnostics/ReportText.h"
#include "diagnostics/SizeFreqMap.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "services/MgrRegistry.h"
#include "services/Output.h"

#include <cstdint>
#include <ostream>

namespace VOK::MemPool {

namespace {

/// The smallest bucket size that is worth a pool: a printed figure, nothing tests it.
constexpr std::uint32_t minBucketSize = 128;

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
    for (std::uint32_t i = 0; i < pool.numGroups; ++i)
      if (pool.groups[i] != nullptr) Add(*pool.groups[i]);
    for (const ExtRec* e = pool.extRecs; e != nullptr; e = e->next)
      usedSizes.Count(e->length, 1);
  }
};

void WriteHeader(std::ostream& os, std::uint32_t depth, const BucketMgr& pool,
                 const Figures& figures) {
  os << Indent(depth) << "MemPool::Mgr " << pool.name << std::endl;
  const std::string indent = Indent(depth + 1);
  HeaderText(os, indent, "Version     : ", GetVersion());
  HeaderText(os, indent, "Addr        : ", PtrText(&pool));
  HeaderNumber(os, indent, "Sizeof      : ", sizeof(BucketMgr));
  HeaderNumber(os, indent, "Bucket Size : ", pool.bucketSize);
  HeaderNumber(os, indent, "Num Groups  : ", pool.numGroups);
  HeaderNumber(os, indent, "Num Buckets : ", pool.GetNumBuckets());
  HeaderNumber(os, indent, "   Empty    : ", figures.emptyBuckets);
  HeaderNumber(os, indent, "   Full     : ", figures.fullBuckets);
  HeaderNumber(os, indent, "Used Recs   : ", figures.usedRecs);
  HeaderNumber(os, indent, "Ext Recs    : ", pool.numExtRecs);
  HeaderNumber(os, indent, "Free Recs   : ", figures.freeRecs);
  HeaderNumber(os, indent, "Free Bucks  : ", figures.freeBucks);
  HeaderNumber(os, indent, "Free BucksM : ", figures.freeBucksM);
  HeaderNumber(os, indent, "Enabled     : ", pool.enabled);
  HeaderNumber(os, indent, "Max Ext Sz  : ", maxRequest);
  HeaderNumber(os, indent, "Min Buck Sz : ", minBucketSize);
  HeaderNumber(os, indent, "Max Buck Sz : ", maxBucketSize);
  HeaderNumber(os, indent, "Min Rec Sz  : ", pool.minRecSize);
  HeaderNumber(os, indent, "Max Rec Sz  : ", pool.maxRecSize);
  HeaderNumber(os, indent, "Data Align  : ", pool.dataAlignment);
  HeaderNumber(os, indent, "Sizeof Buck : ", sizeof(Bucket));
  HeaderNumber(os, indent, "Sizeof Hdr  : ", sizeof(Rec));
  HeaderNumber(os, indent, "Sizeof Free : ", sizeof(Rec));
  HeaderNumber(os, indent, "Sizeof Used : ", sizeof(Rec));
}

void ReportAll(bool detailed) {
  for (const auto& [name, pool] : MgrRegistry::Entries())
    pool->mgr->GetBucketMgr()->Dbg(StandardOutput(), 0, detailed, detailed, detailed);
}

} // namespace

void BucketMgr::Dbg(std::ostream& os, std::uint32_t depth, bool detailed, bool showRecs,
                    bool showFreeList) const {
  const Figures figures(*this);
  WriteHeader(os, depth, *this, figures);
  DbgHistogram(os, depth + 2, figures.usedSizes);
  DbgBuckets(os, depth);
  DbgFreeBuckets(os, depth, figures.freeBucks, figures.freeBucksM);
  DbgExtRecs(os, depth);
  if (!detailed) return;

  std::uint32_t number = 0;
  for (std::uint32_t i = 0; i < numGroups; ++i) {
    if (groups[i] == nullptr) continue;
    for (const Bucket* b = groups[i]->head1; b != nullptr; b = b->next1)
      b->Dbg(os, ++number, depth + 1, showRecs, showFreeList);
  }
}

void Mgr::Dbg() const { bucketMgr->Dbg(StandardOutput(), 0, false, false, false); }

void Mgr::DbgDetailed() const { bucketMgr->Dbg(StandardOutput(), 0, true, true, true); }

void Dbg() { ReportAll(false); }

void DbgDetailed() { ReportAll(true); }

} // namespace VOK::MemPool
