#include "report/Form.h"

#include <fmt/format.h>

namespace VOK::MemPool::Tools {

namespace {

/// Visits a header block for the line of a label, and for the line after the block.
struct LineFinder {
  std::string_view label;
  std::size_t next; ///< at first the line after the title
  std::size_t found = 0;

  template <class Value>
  void Line(const char* text, const char*, const Value&) {
    if (text == label) found = next;
    ++next;
  }
};

template <class Block>
LineFinder Find(const Block& block, std::size_t title, std::string_view label) {
  LineFinder finder{label, title + 1};
  VisitLines(block, finder);
  return finder;
}

// A section follows an empty line, of which `line` is the number, and the number of the line after
// it is returned.

template <class Row>
std::size_t NumberTable(Table<Row>& table, std::size_t line) {
  table.line = line + 1;
  return table.LineOf(table.rows.size());
}

template <class Row>
std::size_t NumberTable(Table<Row>& table, const std::optional<Warning>& warning,
                        std::size_t line) {
  return NumberTable(table, line) + (warning ? 1 : 0);
}

std::size_t NumberMap(Map& map, std::size_t line) {
  map.line = line + 1;
  return map.LineOf(map.labels.size() * Map::boxesPerRow);
}

std::size_t NumberBucket(BucketReport& bucket, std::size_t line) {
  bucket.line = line + 1;
  line = Find(bucket, bucket.line, "").next;
  line = NumberTable(bucket.records, bucket.recordsWarning, line);
  line = NumberTable(bucket.histogram, line);
  line = NumberMap(bucket.map, line);
  line = NumberTable(bucket.freeList, bucket.freeListWarning, line);
  return line + 1; // an empty line
}

} // namespace

std::string HeadingLine(std::span<const Column> columns) {
  std::string line(tableIndent);
  for (const Column& column : columns)
    line += fmt::format("{:<{}} ", column.title, column.width);
  return line;
}

std::string RuleLine(std::span<const Column> columns) {
  std::string line(tableIndent);
  for (const Column& column : columns)
    line += fmt::format("{:=>{}} ", "", column.width);
  return line;
}

std::string MapHeading(std::size_t columns) {
  std::string line(6, ' ');
  for (std::size_t i = 1; i <= columns; ++i)
    line += fmt::format("    {}     ", i);
  return line;
}

std::string MapRule(std::size_t boxes) {
  std::string line = "     +";
  for (std::size_t i = 0; i < boxes; ++i)
    line += "---------+";
  return line;
}

std::string BucketMark(Number number) {
  return fmt::format("{}{}{:03}", titleIndent, BucketTitle::bucket, number);
}

std::string AddressText(Address address) {
  return fmt::format("{:>8}", address.value == 0 ? "0" : fmt::format("{:#x}", address.value));
}

const char* TypeText(Type type) {
  switch (type) {
  case Type::Free:
    return TypeName::free;
  case Type::Used:
    return TypeName::used;
  case Type::Ext:
    return TypeName::ext;
  case Type::Unknown:
    break;
  }
  return TypeName::unknown;
}

std::size_t LineOf(const Report& report, std::string_view label) {
  return Find(report, report.TitleEnd(), label).found;
}

std::size_t LineOf(const BucketReport& bucket, std::string_view label) {
  return Find(bucket, bucket.line, label).found;
}

std::size_t NumberLines(Report& report) {
  std::size_t line = Find(report, report.TitleEnd(), "").next;
  line = NumberTable(report.histogram, line);
  line = NumberTable(report.buckets, line);
  line = NumberTable(report.freeBuckets, line) + 1; // an empty line
  line = NumberTable(report.extRecs, line) + 1;     // likewise
  for (BucketReport& bucket : report.bucketReports)
    line = NumberBucket(bucket, line);
  return line;
}

} // namespace VOK::MemPool::Tools
