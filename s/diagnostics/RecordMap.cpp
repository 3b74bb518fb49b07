// The map of a bucket: a grid of boxes, one a record in address order, that shows at a glance what
// is in use, where the free list starts and where each free record points next.
// Test: tests/report_test.cpp.
#include "MemPool"

#include "diagnostics/Records.h"
#include "engine/Bucket.h"

#include <algorithm>
#include <cstdint>
#include <iomanip>
#include <ostream>
#include <string>

namespace VOK::MemPool {

namespace {

using Recs = vector<const Rec*>;

/// The margin of every line but the heading and the size line.
std::ostream& Margin(std::ostream& os) { return os << std::setw(5) << " "; }

/// A value that fills its box from the left, followed by the wall.
template <class Value>
void Box(std::ostream& os, int width, const Value& value) {
  os << std::left << std::setw(width) << value << std::right << "| ";
}

/// What a box says beside its wall: a tag of two characters and a number.
template <class Number>
void TaggedBox(std::ostream& os, const char* tag, Number number) {
  os << tag;
  Box(os, 6, number);
}

void Heading(std::ostream& os, std::uint32_t numbers) {
  os << std::setw(6) << " ";
  for (std::uint32_t i = 1; i <= numbers; ++i)
    os << "    " << i << "     ";
  os << std::endl;
}

// Each of these writes a line of `cells` boxes, from the record at index `first`.

void DbgMapRule(std::ostream& os, std::uint16_t cells) {
  Margin(os) << "+";
  for (std::uint16_t i = 0; i < cells; ++i)
    os << "---------+";
  os << std::endl;
}

void DbgMapTypes(std::ostream& os, const Bucket& bucket, std::uint16_t cells, std::uint16_t first,
                 const Recs& recs) {
  Margin(os) << "| ";
  for (std::uint32_t i = first; i < first + cells; ++i) {
    const std::uint32_t offset = bucket.OffsetOf(recs[i]);
    const std::string label = TypeLabel(TypeAt(bucket, offset));
    Box(os, 8, offset == bucket.freeHead ? label + " +" : label);
  }
  os << std::endl;
}

void DbgMapOffsets(std::ostream& os, const Bucket& bucket, std::uint16_t cells, std::uint16_t first,
                   const Recs& recs) {
  Margin(os) << "| ";
  for (std::uint32_t i = first; i < first + cells; ++i)
    TaggedBox(os, "o=", bucket.OffsetOf(recs[i]));
  os << std::endl;
}

void DbgMapSizes(std::ostream& os, const Bucket& bucket, std::uint16_t cells, std::uint16_t first) {
  os << std::setw(4) << first << " | ";
  for (std::uint16_t i = 0; i < cells; ++i)
    TaggedBox(os, "s=", bucket.recSize);
  os << std::endl;
}

void DbgMapData(std::ostream& os, const Bucket& bucket, std::uint16_t cells, std::uint16_t first,
                const Recs& recs) {
  Margin(os) << "| ";
  for (std::uint32_t i = first; i < first + cells; ++i) {
    const RecType type = TypeAt(bucket, bucket.OffsetOf(recs[i]));
    if (type == RecType::Free)
      TaggedBox(os, "n=", recs[i]->Offset());
    else if (type == RecType::Used)
      TaggedBox(os, "d=", bucket.recSize - recHeaderSize);
    else
      TaggedBox(os, "u=", 0u);
  }
  os << std::endl;
}

} // namespace

void Bucket::DbgMap(std::ostream& os) const {
  constexpr std::uint16_t boxes = 8; // in a full row
  const std::uint32_t totalRecs = TotalRecs();
  Recs recs;
  recs.Reserve(totalRecs);
  ForEachRecord(*this, [&](std::uint32_t offset) { recs.Append(RecAt(offset)); });

  const auto row = [&](std::uint16_t cells, std::uint16_t first) {
    DbgMapTypes(os, *this, cells, first, recs);
    DbgMapOffsets(os, *this, cells, first, recs);
    DbgMapSizes(os, *this, cells, first);
    DbgMapData(os, *this, cells, first, recs);
  };
  const auto width = static_cast<std::uint16_t>(std::min<std::uint32_t>(recs.count, boxes));
  const auto rest = static_cast<std::uint16_t>(totalRecs % boxes);
  const auto full = static_cast<std::uint16_t>(totalRecs - rest);

  Heading(os, width);
  for (std::uint16_t first = 0; first < full; first = static_cast<std::uint16_t>(first + boxes)) {
    DbgMapRule(os, boxes);
    row(boxes, first);
  }
  DbgMapRule(os, width);
  if (rest == 0) return;
  row(rest, full);
  DbgMapRule(os, rest);
}

} // namespace VOK::MemPool
