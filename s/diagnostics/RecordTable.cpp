// The table of all records of a bucket in address order. It doesn't use the free list, so it shows
// what lies in the bucket even where that list is broken.
// Test: tests/report_test.cpp.
#include "diagnostics/Records.h"
#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"
#include "services/Messages.h"

#include <cstdint>

namespace VOK::MemPool {

void Bucket::DbgRecs(std::ostream& os, std::uint32_t depth) const {
  const std::uint32_t totalRecs = TotalRecs();
  Table table(os, depth, BucketColumns::records);
  std::uint32_t count = 0;
  ForEachRecord(*this, [&](std::uint32_t offset) {
    const RecType type = TypeAt(*this, offset);
    const std::uint32_t dataSize = type == RecType::Used ? recSize - recHeaderSize : 0;
    table.Row().Id(++count).Cell(TypeLabel(type)).Cell(offset).Cell(recSize);
    table.Cell(offset + recSize).Cell(dataSize).Cell(PtrText(RecAt(offset))).End();
  });
  if (count != totalRecs)
    Messages::Warning({"Did not reach the expected number of recs ", count, " < ", totalRecs});
}

} // namespace VOK::MemPool
