// The table of a bucket's free list, by its links: the order in which the records will be handed
// out. The chain lies in the records, and a damaged one can run in a circle, so the walk is bound.
// Test: tests/report_test.cpp.
#include "diagnostics/Records.h"
#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"
#include "services/Messages.h"

#include <cstdint>

namespace VOK::MemPool {

void Bucket::DbgFreeList(std::ostream& os, std::uint32_t depth) const {
  Table table(os, depth, BucketColumns::freeList);
  const std::uint32_t totalRecs = TotalRecs();
  std::uint32_t count = 0;
  for (std::uint32_t offset = freeHead; HoldsHeader(*this, offset); ++count) {
    const std::uint32_t next = RecAt(offset)->Offset();
    table.Row().Id(count + 1).Cell(offset).Cell(next).Cell(recSize).Cell(PtrText(RecAt(offset)));
    table.Cell(PtrText(next != 0 ? RecAt(next) : nullptr)).End();
    if (count > totalRecs) {
      Messages::Warning({"Exceeded the number of total number of recs ", count, " > ", totalRecs});
      return;
    }
    offset = next;
  }
}

} // namespace VOK::MemPool
