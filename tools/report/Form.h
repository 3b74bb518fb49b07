// The form of a report: which value it shows where, one description for the text and for JSON in
// both directions; and the lines of the text that hold no value. A visitor is called once per
// value, in the order of the text, with the value's key and, in a header block, its label.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_FORM_H
#define VOK_MEMPOOL_TOOLS_REPORT_FORM_H

#include "diagnostics/ReportLayout.h"
#include "report/Model.h"

#include <concepts>
#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

namespace VOK::MemPool::Tools {

/// A model's struct, constant or not.
template <class Type, class Model>
concept Is = std::same_as<std::remove_const_t<Type>, Model>;

/// The header block of a pool.
template <Is<Report> R, class Visitor>
void VisitLines(R& report, Visitor& visitor) {
  visitor.Line(PoolLabel::version, "version", report.version);
  visitor.Line(PoolLabel::addr, "addr", report.addr);
  visitor.Line(PoolLabel::sizeofPool, "sizeof", report.sizeofPool);
  visitor.Line(PoolLabel::bucketSize, "bucketSize", report.bucketSize);
  visitor.Line(PoolLabel::numGroups, "numGroups", report.numGroups);
  visitor.Line(PoolLabel::numBuckets, "numBuckets", report.numBuckets);
  visitor.Line(PoolLabel::empty, "empty", report.empty);
  visitor.Line(PoolLabel::full, "full", report.full);
  visitor.Line(PoolLabel::usedRecs, "usedRecs", report.usedRecs);
  visitor.Line(PoolLabel::extRecs, "extRecs", report.numExtRecs);
  visitor.Line(PoolLabel::freeRecs, "freeRecs", report.freeRecs);
  visitor.Line(PoolLabel::freeBucks, "freeBucks", report.freeBucks);
  visitor.Line(PoolLabel::freeBucksM, "freeBucksM", report.freeBucksM);
  visitor.Line(PoolLabel::enabled, "enabled", report.enabled);
  visitor.Line(PoolLabel::maxExtSize, "maxExtSize", report.maxExtSize);
  visitor.Line(PoolLabel::minBucketSize, "minBucketSize", report.minBucketSize);
  visitor.Line(PoolLabel::maxBucketSize, "maxBucketSize", report.maxBucketSize);
  visitor.Line(PoolLabel::minRecSize, "minRecSize", report.minRecSize);
  visitor.Line(PoolLabel::maxRecSize, "maxRecSize", report.maxRecSize);
  visitor.Line(PoolLabel::dataAlignment, "dataAlignment", report.dataAlignment);
  visitor.Line(PoolLabel::sizeofBucket, "sizeofBucket", report.sizeofBucket);
  visitor.Line(PoolLabel::sizeofHeader, "sizeofHeader", report.sizeofHeader);
  visitor.Line(PoolLabel::sizeofFree, "sizeofFree", report.sizeofFree);
  visitor.Line(PoolLabel::sizeofUsed, "sizeofUsed", report.sizeofUsed);
}

/// The header block of a bucket.
template <Is<BucketReport> B, class Visitor>
void VisitLines(B& bucket, Visitor& visitor) {
  visitor.Line(BucketLabel::addr, "addr", bucket.addr);
  visitor.Line(BucketLabel::sizeofBucket, "sizeof", bucket.sizeofBucket);
  visitor.Line(BucketLabel::parent, "parent", bucket.parent);
  visitor.Line(BucketLabel::next1, "next1", bucket.next1);
  visitor.Line(BucketLabel::prev1, "prev1", bucket.prev1);
  visitor.Line(BucketLabel::next2, "next2", bucket.next2);
  visitor.Line(BucketLabel::prev2, "prev2", bucket.prev2);
  visitor.Line(BucketLabel::recsBase, "recsBase", bucket.recsBase);
  visitor.Line(BucketLabel::recsBeg, "recsBeg", bucket.recsBeg);
  visitor.Line(BucketLabel::recsEnd, "recsEnd", bucket.recsEnd);
  visitor.Line(BucketLabel::recSize, "recSize", bucket.recSize);
  visitor.Line(BucketLabel::recsSize, "recsSize", bucket.recsSize);
  visitor.Line(BucketLabel::totalRecs, "totalRecs", bucket.totalRecs);
  visitor.Line(BucketLabel::usedRecs, "usedRecs", bucket.usedRecs);
  visitor.Line(BucketLabel::usedBytes, "usedBytes", bucket.usedBytes);
  visitor.Line(BucketLabel::freeRecs, "freeRecs", bucket.freeRecs);
  visitor.Line(BucketLabel::freeBytes, "freeBytes", bucket.freeBytes);
  visitor.Line(BucketLabel::freeHead, "freeHead", bucket.freeHead);
  visitor.Line(BucketLabel::headerOffset, "headerOffset", bucket.headerOffset);
}

// The rows. A separator follows a Cell, but not a LastCell.

template <class Row, class Visitor>
requires Is<Row, SizeRow> || Is<Row, BucketSizeRow>
void VisitCells(Row& row, Visitor& visitor) {
  visitor.Cell("id", row.id);
  visitor.Cell("size", row.size);
  visitor.Cell("freq", row.freq);
  visitor.LastCell("bar", row.bar);
}

template <Is<BucketRow> Row, class Visitor>
void VisitCells(Row& row, Visitor& visitor) {
  visitor.Cell("id", row.id);
  visitor.Cell("group", row.group);
  visitor.Cell("used", row.used);
  visitor.Cell("free", row.free);
  visitor.Cell("total", row.total);
  visitor.Cell("percent", row.percent);
  visitor.Cell("recSize", row.recSize);
  visitor.Cell("addr", row.addr);
}

template <Is<FreeBucketRow> Row, class Visitor>
void VisitCells(Row& row, Visitor& visitor) {
  if (visitor.HasCells("id", 4, row.isFirst)) {
    visitor.Cell("id", row.id);
    visitor.Cell("group", row.group);
    visitor.Cell("size", row.size);
    visitor.Cell("count", row.count);
  }
  visitor.Cell("off", row.off);
  visitor.LastCell("addr", row.addr);
}

template <Is<ExtRow> Row, class Visitor>
void VisitCells(Row& row, Visitor& visitor) {
  visitor.Cell("id", row.id);
  visitor.Cell("length", row.length);
  visitor.Cell("data", row.data);
  visitor.Cell("heap", row.heap);
  visitor.Cell("next", row.next);
  visitor.Cell("prev", row.prev);
}

template <Is<RecordRow> Row, class Visitor>
void VisitCells(Row& row, Visitor& visitor) {
  visitor.Cell("id", row.id);
  visitor.Cell("type", row.type);
  visitor.Cell("offset", row.offset);
  visitor.Cell("size", row.size);
  visitor.Cell("end", row.end);
  visitor.Cell("dataSize", row.dataSize);
  visitor.Cell("addr", row.addr);
}

template <Is<FreeRow> Row, class Visitor>
void VisitCells(Row& row, Visitor& visitor) {
  visitor.Cell("id", row.id);
  visitor.Cell("offset", row.offset);
  visitor.Cell("next", row.next);
  visitor.Cell("size", row.size);
  visitor.Cell("addr", row.addr);
  visitor.Cell("nextAddr", row.nextAddr);
}

/// The columns of each kind of row.
template <class Row>
constexpr std::span<const Column> ColumnsOf() {
  if constexpr (std::same_as<Row, SizeRow>)
    return PoolColumns::histogram;
  else if constexpr (std::same_as<Row, BucketRow>)
    return PoolColumns::buckets;
  else if constexpr (std::same_as<Row, FreeBucketRow>)
    return PoolColumns::freeBuckets;
  else if constexpr (std::same_as<Row, ExtRow>)
    return PoolColumns::extRecs;
  else if constexpr (std::same_as<Row, RecordRow>)
    return BucketColumns::records;
  else if constexpr (std::same_as<Row, BucketSizeRow>)
    return BucketColumns::histogram;
  else
    return BucketColumns::freeList;
}

/// The most stars that a bar can have: in a pool's histogram twice the width of its column.
inline constexpr Number maxStars = 100;
static_assert(maxStars == 2 * PoolColumns::histogram[3].width);

/// The largest whole part of a percentage: all records used where a bucket has room for one.
inline constexpr std::uint64_t maxPercent = UINT64_C(429496729500);

// Indentations are those of depth 0.
inline constexpr std::string_view headerIndent = "   ";
inline constexpr std::string_view titleIndent = "   ";
inline constexpr std::string_view histogramIndent = "         "; // of the pool's histogram title
inline constexpr std::string_view tableIndent = "      ";
inline constexpr std::string_view bucketIndent = "      "; // of a bucket's header block

inline constexpr std::string_view mapMargin = "     | ";
inline constexpr std::string_view wall = "| ";

/// What a warning begins with; the number of its source line follows in a field of five.
inline constexpr std::string_view warningStart = "WARNING:../s/MemPool:";
inline constexpr int warningWidth = 5;

std::string HeadingLine(std::span<const Column> columns);
std::string RuleLine(std::span<const Column> columns);
std::string MapHeading(std::size_t columns);
std::string MapRule(std::size_t boxes);

/// What a bucket's titles begin with.
std::string BucketMark(Number number);

/// An address as a report shows it: padded on the left to eight characters.
std::string AddressText(Address address);

const char* TypeText(Type type);

// Line numbers. Those of a header block count from the last line of its title.

/// The line of a label in the block of a pool or of a bucket.
std::size_t LineOf(const Report& report, std::string_view label);
std::size_t LineOf(const BucketReport& bucket, std::string_view label);

/// Numbers the lines of a report from that of its title, and returns the number of the line after
/// it.
std::size_t NumberLines(Report& report);

} // namespace VOK::MemPool::Tools

#endif
