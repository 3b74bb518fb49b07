// The report of one bucket: its header block, and the sections that show its records. It reads the
// bucket as it finds it and mends nothing.
// Test: tests/report_test.cpp.
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"

#include <cstdint>
#include <ostream>

namespace VOK::MemPool {

namespace {

/// A title's beginning: what names the bucket.
std::ostream& Mark(std::ostream& os, const std::string& indent, std::uint32_t bucketNum) {
  os << indent << "MemPool::Bucket #";
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
  HeaderText(os, indent, "Addr        : ", PtrText(this));
  HeaderNumber(os, indent, "Sizeof      : ", sizeof(Bucket));
  HeaderText(os, indent, "Parent      : ", PtrText(parent));
  HeaderText(os, indent, "Next1       : ", PtrText(next1));
  HeaderText(os, indent, "Prev1       : ", PtrText(prev1));
  HeaderText(os, indent, "Next2       : ", PtrText(next2));
  HeaderText(os, indent, "Prev2       : ", PtrText(prev2));
  HeaderText(os, indent, "Recs Base   : ", PtrText(RecsBase()));
  HeaderText(os, indent, "Recs Beg    : ", PtrText(RecAt(2)));
  HeaderText(os, indent, "Recs End    : ", PtrText(RecAt(recsSize)));
  HeaderNumber(os, indent, "Recs Size   : ", recSize);
  HeaderNumber(os, indent, "Size        : ", recsSize);
  HeaderNumber(os, indent, "Total Recs  : ", totalRecs);
  HeaderNumber(os, indent, "Used Recs   : ", usedRecs);
  HeaderNumber(os, indent, "Used Bytes  : ", dataSize * usedRecs);
  HeaderNumber(os, indent, "Free Recs   : ", freeRecs);
  HeaderNumber(os, indent, "Free Bytes  : ", dataSize * freeRecs);
  HeaderNumber(os, indent, "Free Head   : ", freeHead);
  HeaderNumber(os, indent, "Hdr Offset  : ", sizeof(Bucket));

  if (showRecs) {
    title(" ALL RECORDS (", totalRecs);
    DbgRecs(os, depth + 1);
    title(" USED DATA FREQ DIST HISTOGRAM (", usedRecs);
    DbgHistogram(os, depth + 1);
    title(" ALL RECORDS MAP (", totalRecs);
    DbgMap(os);
  }
  if (showFreeList) {
    title(" FREE LIST (", freeRecs);
    DbgFreeList(os, depth + 1);
  }
  os << std::endl;
}

} // namespace VOK::MemPool
