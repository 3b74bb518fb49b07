// How many live records of each size there are: the scan of a bucket, the histogram of a pool,
// whose bars are scaled to the most frequent size, and the one of a bucket, one star a record.
// Test: tests/report_test.cpp.
#include "diagnostics/Records.h"
#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "diagnostics/SizeFreqMap.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"

#include <algorithm>
#include <cstdint>
#include <ostream>

namespace VOK::MemPool {

namespace {

/// The stars that a bar is meant to have at most: the width of its column.
constexpr std::uint32_t barWidth = PoolColumns::histogram[3].width;
static_assert(BucketColumns::histogram[3].width == barWidth);

std::uint32_t Scale(const SizeFreqMap& sizes) {
  std::uint32_t peak = 0;
  for (const auto& [size, frequency] : sizes.frequencies)
    peak = std::max(peak, frequency);
  return std::max(peak / barWidth, 1u);
}

} // namespace

// From what the records say, and not from the bucket's own count.
void Bucket::CollectUsedSizes(SizeFreqMap& sizes) const {
  std::uint32_t used = 0;
  ForEachRecord(*this, [&](std::uint32_t offset) {
    if (TypeAt(*this, offset) == RecType::Used) ++used;
  });
  sizes.Count(recSize - recHeaderSize, used);
}

void BucketMgr::DbgHistogram(std::ostream& os, std::uint32_t depth,
                             const SizeFreqMap& sizes) const {
  os << std::endl;
  os << Indent(depth + 1) << PoolTitle::histogram << sizes.frequencies.size() << ")" << std::endl;
  Table table(os, depth, PoolColumns::histogram);
  const std::uint32_t scale = Scale(sizes);
  std::uint32_t id = 0;
  for (const auto& [size, frequency] : sizes.frequencies)
    table.Row().Cell(++id).Cell(size).Cell(frequency).Bar(frequency / scale + 1).End();
}

void Bucket::DbgHistogram(std::ostream& os, std::uint32_t depth) const {
  SizeFreqMap sizes;
  CollectUsedSizes(sizes);
  Table table(os, depth, BucketColumns::histogram);
  std::uint32_t id = 0;
  for (const auto& [size, frequency] : sizes.frequencies) {
    table.Row().Id(++id).Cell(size).Cell(frequency).Bar(std::min(frequency, barWidth));
    if (frequency > barWidth) table.Text("+");
    table.End();
  }
}

} // namespace VOK::MemPool
