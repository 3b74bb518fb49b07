// A pool's report as data: what its text says, each value once, in the order of the text. Values
// are kept as they were printed, also where they are inconsistent.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_MODEL_H
#define VOK_MEMPOOL_TOOLS_REPORT_MODEL_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

// The kinds of value, each with a form of its own in the text.

using Number = std::uint32_t;

struct Address {
  std::uint64_t value = 0;
  bool operator==(const Address&) const = default;
};

/// A number that a table pads with zeros.
struct Id {
  Number value = 0;
};

struct Percent {
  std::uint64_t thousandths = 0;
};

/// Stars; `more` is the "+" after them.
struct Bar {
  Number stars = 0;
  bool more = false;
};

enum class Type : std::uint8_t { Free, Used, Ext, Unknown };

/// A line that the library writes below a table whose walk failed, with the line of the library's
/// source that writes it.
struct Warning {
  Number source = 0;
  std::string text; ///< up to the count
  Number count = 0;
  Number total = 0;
};

/// A table under its title, which has `count` in brackets.
template <class RowType>
struct Table {
  using Row = RowType;

  std::size_t line = 0; ///< of the title
  Number count = 0;
  std::vector<Row> rows;

  /// The line of a row, which follows title, heading and rule.
  std::size_t LineOf(std::size_t row) const { return line + 3 + row; }
};

// The rows of a pool's tables.

struct SizeRow {
  Number id, size, freq;
  Bar bar;
};

struct BucketRow {
  Number id, group, used, free, total;
  Percent percent;
  Number recSize;
  Address addr;
};

/// The first row of a group has all fields, a further one `off` and `addr` alone.
struct FreeBucketRow {
  bool isFirst;
  Number id, group, size, count;
  Number off;
  Address addr;
};

struct ExtRow {
  Number id, length;
  Address data, heap, next, prev;
};

// The rows of a bucket's tables.

struct RecordRow {
  Id id;
  Type type;
  Number offset, size, end, dataSize;
  Address addr;
};

struct BucketSizeRow {
  Id id;
  Number size, freq;
  Bar bar;
};

struct FreeRow {
  Id id;
  Number offset, next, size;
  Address addr, nextAddr;
};

/// A box of the record map.
struct Box {
  Type type;
  bool isHead; ///< marked as the head of the free list
  char tag;    ///< what `number` is: 'n' next offset, 'd' data size, 'u' unknown
  Number offset, size, number;
};

struct Map {
  std::size_t line = 0; ///< of the title
  Number count = 0;
  Number columns = 0;         ///< numbers in the heading, and boxes of the rule after full rows
  std::vector<Number> labels; ///< one per grid row
  std::vector<Box> boxes;

  static constexpr std::size_t boxesPerRow = 8;

  /// The first line of the grid row that holds a box. Title, heading and a rule precede the first
  /// row, and a row is four lines and the next rule.
  std::size_t LineOf(std::size_t box) const { return line + 3 + box / boxesPerRow * 5; }
};

struct BucketReport {
  std::size_t line = 0; ///< of the title; the header block follows
  Number number = 0;
  Address addr;
  Number sizeofBucket = 0;
  Address parent, next1, prev1, next2, prev2, recsBase, recsBeg, recsEnd;
  Number recSize = 0, recsSize = 0, totalRecs = 0, usedRecs = 0, usedBytes = 0;
  Number freeRecs = 0, freeBytes = 0, freeHead = 0, headerOffset = 0;
  Table<RecordRow> records;
  std::optional<Warning> recordsWarning;
  Table<BucketSizeRow> histogram;
  Map map;
  Table<FreeRow> freeList;
  std::optional<Warning> freeListWarning;
};

struct Report {
  std::size_t line = 0; ///< of the title, counted from 1
  bool isCrLf = false;  ///< its lines end as on Windows
  std::string name, version;
  Address addr;
  Number sizeofPool = 0, bucketSize = 0, numGroups = 0, numBuckets = 0, empty = 0, full = 0;
  Number usedRecs = 0, numExtRecs = 0, freeRecs = 0, freeBucks = 0, freeBucksM = 0, enabled = 0;
  Number maxExtSize = 0, minBucketSize = 0, maxBucketSize = 0, minRecSize = 0, maxRecSize = 0;
  Number dataAlignment = 0, sizeofBucket = 0, sizeofHeader = 0, sizeofFree = 0, sizeofUsed = 0;
  Table<SizeRow> histogram;
  Table<BucketRow> buckets;
  Table<FreeBucketRow> freeBuckets;
  Number freeBucketsM = 0; ///< the second number of that table's title
  Table<ExtRow> extRecs;
  std::vector<BucketReport> bucketReports; ///< empty in the plain form

  bool IsOff() const { return enabled == 0; }

  /// The last line of the title, which has more than one if the name has line ends.
  std::size_t TitleEnd() const {
    return line + static_cast<std::size_t>(std::count(name.begin(), name.end(), '\n'));
  }
};

} // namespace VOK::MemPool::Tools

#endif
