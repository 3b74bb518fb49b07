// The report of one bucket: its header block, and the sections that show its records. It reads the
// bucket as it finds it and mends nothing.
// Test: tests/report_test.cpp.
#include "diagnostics/ReportLayout.h"
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"

#include <cstdint>
#include <ostream>
#include <string>

namespace VOK::MemPool {

namespace {

/// A title's beginning: what names the bucket.
std::ostream& Mark(std::ostream& os, const std::string& indent, std::uint32_t bucketNum) {
  os << indent << BucketTitle::bucket;
  ZeroFilled(os, 3, bucketNum);
  return os;
}

} // namespace

void Bucket::Dbg(std::ostream& os, std::uint32_t bucketNum, std::uint32_t depth, bool showRecs,
                 bool showFreeList) const {
  const std::string titleIndent = Indent(depth);
  const std::string indent = Indent(depth + 1);
  const std::uint32_t totalRecs = TotalRecs();
  const std::uint32_t usedRecs = totalRecs - freeRecs;
  const std::uint32_t dataSize = recSize - recHeaderSize;
  const auto title = [&](const char* section, std::uint32_t count) {
    os << std::endl;
    Mark(os, titleIndent, bucketNum) << section << count << ")" << std::endl;
  };

  os << std::endl;
  Mark(os, titleIndent, bucketNum) << std::endl;
  HeaderText(os, indent, BucketLabel::addr, PtrText(this));
  HeaderNumber(os, indent, BucketLabel::sizeofBucket, sizeof(Bucket));
  HeaderText(os, indent, BucketLabel::parent, PtrText(parent));
  HeaderText(os, indent, BucketLabel::next1, PtrText(next1));
  HeaderText(os, indent, BucketLabel::prev1, PtrText(prev1));
  HeaderText(os, indent, BucketLabel::next2, PtrText(next2));
  HeaderText(os, indent, BucketLabel::prev2, PtrText(prev2));
  HeaderText(os, indent, BucketLabel::recsBase, PtrText(RecsBase()));
  HeaderText(os, indent, BucketLabel::recsBeg, PtrText(RecAt(2)));
  HeaderText(os, indent, BucketLabel::recsEnd, PtrText(RecAt(recsSize)));
  HeaderNumber(os, indent, BucketLabel::recSize, recSize);
  HeaderNumber(os, indent, BucketLabel::recsSize, recsSize);
  HeaderNumber(os, indent, BucketLabel::totalRecs, totalRecs);
  HeaderNumber(os, indent, BucketLabel::usedRecs, usedRecs);
  HeaderNumber(os, indent, BucketLabel::usedBytes, dataSize * usedRecs);
  HeaderNumber(os, indent, BucketLabel::freeRecs, freeRecs);
  HeaderNumber(os, indent, BucketLabel::freeBytes, dataSize * freeRecs);
  HeaderNumber(os, indent, BucketLabel::freeHead, freeHead);
  HeaderNumber(os, indent, BucketLabel::headerOffset, sizeof(Bucket));

  if (showRecs) {
    title(BucketTitle::records, totalRecs);
    DbgRecs(os, depth + 1);
    title(BucketTitle::histogram, usedRecs);
    DbgHistogram(os, depth + 1);
    title(BucketTitle::map, totalRecs);
    DbgMap(os);
  }
  if (showFreeList) {
    title(BucketTitle::freeList, freeRecs);
    DbgFreeList(os, depth + 1);
  }
  os << std::endl;
}

} // namespace VOK::MemPool
