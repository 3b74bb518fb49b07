// The three tables of a pool's report: every bucket with its fill, the buckets that can still serve
// by size class, and the heap blocks beyond the largest record.
// Test: tests/report_test.cpp.
#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"

#include <cstdint>
#include <ostream>

namespace VOK::MemPool {

namespace {

double PercentUsed(std::uint32_t usedRecs, std::uint32_t totalRecs) {
  return totalRecs == 0 ? 0.0 : usedRecs * 100.0 / totalRecs;
}

std::uint32_t CountFree(const Group& group) {
  std::uint32_t count = 0;
  for (const Bucket* b = group.head2; b != nullptr; b = b->next2)
    ++count;
  return count;
}

} // namespace

void BucketMgr::DbgBuckets(std::ostream& os, std::uint32_t depth) const {
  os << std::endl;
  os << Indent(depth + 1) << PoolTitle::buckets << GetNumBuckets() << ")" << std::endl;
  Table table(os, depth + 2, PoolColumns::buckets);
  std::uint32_t id = 0;
  ForEachGroup(*this, [&](const Group& group, std::uint32_t i) {
    for (const Bucket* b = group.head1; b != nullptr; b = b->next1) {
      const std::uint32_t totalRecs = b->TotalRecs();
      const std::uint32_t usedRecs = totalRecs - b->freeRecs;
      table.Row().Cell(++id).Cell(i).Cell(usedRecs).Cell(b->freeRecs).Cell(totalRecs);
      table.Percent(PercentUsed(usedRecs, totalRecs)).Cell(b->recSize).Cell(PtrText(b)).End();
    }
  });
}

void BucketMgr::DbgFreeBuckets(std::ostream& os, std::uint32_t depth, std::uint32_t freeBucks,
                               std::uint32_t freeBucksM) const {
  os << std::endl;
  os << Indent(depth + 1) << PoolTitle::freeBuckets << freeBucks << "," << freeBucksM << ")"
     << std::endl;
  Table table(os, depth + 2, PoolColumns::freeBuckets);
  std::uint32_t id = 0;
  ForEachGroup(*this, [&](const Group& group, std::uint32_t i) {
    const Bucket* b = group.head2;
    if (b == nullptr) return;
    table.Row().Cell(++id).Cell(i).Cell(b->recSize - recHeaderSize).Cell(CountFree(group));
    table.Cell(0u).LastCell(PtrText(b)).End();
    std::uint32_t off = 0;
    while ((b = b->next2) != nullptr)
      table.Row().Blank().Blank().Blank().Blank().Cell(++off).LastCell(PtrText(b)).End();
  });
  os << std::endl;
}

void BucketMgr::DbgExtRecs(std::ostream& os, std::uint32_t depth) const {
  os << std::endl;
  os << Indent(depth + 1) << PoolTitle::extRecs << numExtRecs << ")" << std::endl;
  Table table(os, depth + 2, PoolColumns::extRecs);
  std::uint32_t id = 0;
  for (const ExtRec* e = extRecs; e != nullptr; e = e->next) {
    table.Row().Cell(++id).Cell(e->length).Cell(PtrText(e->Data())).Cell(PtrText(e));
    table.Cell(PtrText(e->next)).Cell(PtrText(e->prev)).End();
  }
  os << std::endl;
}

} // namespace VOK::MemPool
