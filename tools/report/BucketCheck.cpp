// The reports of a pool's buckets: each against itself, its neighbours and the pool's tables.
// Test: tests/tools/tools_test.py.
#include "report/Checker.h"

#include <map>

namespace VOK::MemPool::Tools {

namespace {

using Sum = std::uint64_t;

class BucketCheck {
public:
  BucketCheck(const BucketReport& bucket_, Checker& checker_)
      : bucket(bucket_), checker(checker_) {}

  void Run(Sum headerSize) {
    dataSize = bucket.recSize < headerSize ? 0 : bucket.recSize - headerSize;
    Header();
    Records();
    Histogram();
    CheckMap();
    FreeList();
  }

  std::size_t Line(const char* label) const { return LineOf(bucket, bucket.line, label); }

private:
  void Header() {
    const Address base{bucket.addr.value + bucket.sizeofBucket - 2};
    checker.Equal(Line(BucketLabel::recsBase), "Recs Base", bucket.recsBase, base,
                  "Addr and Sizeof, less 2");
    checker.Equal(Line(BucketLabel::recsBeg), "Recs Beg", bucket.recsBeg, Address{base.value + 2},
                  "Addr and Sizeof");
    checker.Equal(Line(BucketLabel::recsEnd), "Recs End", bucket.recsEnd,
                  Address{base.value + bucket.recsSize}, "Addr, Sizeof less 2, and Size");
    checker.Equal(Line(BucketLabel::recsSize), "Size", bucket.recsSize,
                  2 + Sum{bucket.totalRecs} * bucket.recSize, "2 and Total Recs of Recs Size");
    checker.Equal(Line(BucketLabel::usedRecs), "Used Recs + Free Recs",
                  Sum{bucket.usedRecs} + bucket.freeRecs, bucket.totalRecs, "Total Recs");
    checker.Equal(Line(BucketLabel::usedBytes), "Used Bytes", bucket.usedBytes,
                  dataSize * bucket.usedRecs, "the data bytes of Used Recs");
    checker.Equal(Line(BucketLabel::freeBytes), "Free Bytes", bucket.freeBytes,
                  dataSize * bucket.freeRecs, "the data bytes of Free Recs");
    if ((bucket.freeHead == 0) != (bucket.freeRecs == 0))
      checker.Add(Line(BucketLabel::freeHead), "Free Head is 0 exactly where Free Recs is");
    checker.Equal(Line(BucketLabel::headerOffset), "Hdr Offset", bucket.headerOffset,
                  bucket.sizeofBucket, "Sizeof");
    if (bucket.parent == Address{}) checker.Add(Line(BucketLabel::parent), "Parent is null");
  }

  void Records() {
    const auto& table = bucket.records;
    checker.Table(table);
    checker.Equal(table.line, "the number of rows", table.rows.size(), bucket.totalRecs,
                  "Total Recs");
    WarningOf(bucket.recordsWarning, table);
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const RecordRow& row = table.rows[i];
      const std::size_t line = table.LineOf(i);
      checker.Equal(line, "Offset", row.offset, 2 + Sum{i} * bucket.recSize, "the rows in front");
      checker.Equal(line, "Size", row.size, bucket.recSize, "Recs Size");
      checker.Equal(line, "End", row.end, Sum{row.offset} + row.size, "Offset and Size");
      checker.Equal(line, "DSize", row.dataSize, row.type == Type::Used ? dataSize : 0,
                    "the data bytes of a used record");
      checker.Equal(line, "Address", row.addr, Address{bucket.recsBase.value + row.offset},
                    "Recs Base and Offset");
      if (row.type == Type::Ext || row.type == Type::Unknown)
        checker.Add(line, "Type is neither FREE nor USED");
      used += row.type == Type::Used ? 1 : 0;
      recordsByOffset.emplace(row.offset, &row);
    }
    checker.Equal(table.line, "the number of USED rows", used, bucket.usedRecs, "Used Recs");
  }

  template <class Row>
  void WarningOf(const std::optional<Warning>& warning, const Table<Row>& table) {
    if (warning) checker.Add(table.LineOf(table.rows.size()), "the library warns of what it found");
  }

  void Histogram() {
    const auto& table = bucket.histogram;
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const BucketSizeRow& row = table.rows[i];
      const std::size_t line = table.LineOf(i);
      checker.Equal(line, "Id", row.id.value, i + 1, "ids have no gap");
      checker.Equal(line, "Size", row.size, dataSize, "the data bytes of a record");
      checker.Equal(line, "Freq", row.freq, used, "USED rows of ALL RECORDS");
      checker.Equal(line, "the bar", row.bar.stars, std::min<Number>(row.freq, maxStars / 2),
                    "Freq up to 50");
      if (row.bar.more != (row.freq > maxStars / 2))
        checker.Add(line, "the bar has a \"+\" exactly above 50");
    }
    checker.Equal(table.line, "the title's count", table.count, bucket.usedRecs, "Used Recs");
    checker.Equal(table.line, "the number of rows", table.rows.size(), used > 0 ? 1 : 0,
                  "one where a record is used");
  }

  void CheckMap() {
    const Map& map = bucket.map;
    checker.Equal(map.line, "the title's count", map.count, map.boxes.size(), "boxes");
    checker.Equal(map.line, "the number of boxes", map.boxes.size(), bucket.totalRecs,
                  "Total Recs");
    checker.Equal(map.line + 1, "the heading", map.columns,
                  std::min(bucket.records.rows.size(), Map::boxesPerRow),
                  "the rows of ALL RECORDS, up to 8");
    for (std::size_t i = 0; i < map.labels.size(); ++i)
      checker.Equal(map.LineOf(i * Map::boxesPerRow) + 2, "the row's label", map.labels[i],
                    i * Map::boxesPerRow, "boxes in front");
    for (std::size_t i = 0; i < std::min(map.boxes.size(), bucket.records.rows.size()); ++i)
      CheckBox(map.boxes[i], bucket.records.rows[i], map.LineOf(i));
  }

  void CheckBox(const Box& box, const RecordRow& row, std::size_t line) {
    const std::string name = fmt::format("in the box of offset {}, ", row.offset);
    checker.Equal(line + 1, name + "o", box.offset, row.offset, "Offset in ALL RECORDS");
    checker.Equal(line + 2, name + "s", box.size, bucket.recSize, "Recs Size");
    if (box.type != row.type) checker.Add(line, name + "the type is not that of ALL RECORDS");
    if (box.isHead != (box.offset == bucket.freeHead))
      checker.Add(line, name + "\" +\" marks another record than Free Head");
    const char tag = row.type == Type::Free ? 'n' : row.type == Type::Used ? 'd' : 'u';
    if (box.tag != tag)
      checker.Add(line + 3, name + "the tag is not that of the type");
    else if (tag == 'n')
      nextByOffset.emplace(box.offset, box.number);
    else
      checker.Equal(line + 3, name + tag, box.number, tag == 'd' ? dataSize : 0,
                    "the data bytes of a used record");
  }

  void FreeList() {
    const auto& table = bucket.freeList;
    checker.Table(table);
    checker.Equal(table.line, "the number of rows", table.rows.size(), bucket.freeRecs,
                  "Free Recs");
    WarningOf(bucket.freeListWarning, table);
    Number expected = bucket.freeHead;
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      CheckFree(table.rows[i], table.LineOf(i), expected);
      expected = table.rows[i].next;
    }
    if (expected != 0 && !bucket.freeListWarning)
      checker.Add(table.line, fmt::format("the list ends in front of offset {}", expected));
    for (const auto& [offset, row] : recordsByOffset)
      if (row->type == Type::Free)
        checker.Add(
            bucket.records.LineOf(static_cast<std::size_t>(row - bucket.records.rows.data())),
            "Type is FREE, and FREE LIST lacks the record");
  }

  /// A row of the list against its row in the record table, which is done with then.
  void CheckFree(const FreeRow& row, std::size_t line, Number offset) {
    checker.Equal(line, "Offset", row.offset, offset, "Next of the row above, or Free Head");
    checker.Equal(line, "Size", row.size, bucket.recSize, "Recs Size");
    checker.Equal(line, "Address", row.addr, Address{bucket.recsBase.value + row.offset},
                  "Recs Base and Offset");
    checker.Equal(line, "Next Addr", row.nextAddr,
                  row.next == 0 ? Address{} : Address{bucket.recsBase.value + row.next},
                  "Recs Base and Next");
    const auto next = nextByOffset.find(row.offset);
    if (next != nextByOffset.end())
      checker.Equal(line, "Next", row.next, next->second, "n in the record's box of the map");
    const auto record = recordsByOffset.find(row.offset);
    if (record == recordsByOffset.end()) {
      checker.Add(line, "no record of ALL RECORDS has this Offset, or it stands here twice");
      return;
    }
    if (record->second->type != Type::Free)
      checker.Add(line, "the record's Type in ALL RECORDS is not FREE");
    recordsByOffset.erase(record);
  }

  const BucketReport& bucket;
  Checker& checker;
  Sum dataSize = 0;
  Sum used = 0; ///< USED rows
  std::map<Number, const RecordRow*> recordsByOffset;
  std::map<Number, Number> nextByOffset; ///< as the map shows it
};

/// The lists on which a pool's buckets stand, as BUCKETS and FREE BUCKETS show them.
class Lists {
public:
  explicit Lists(const Report& report) {
    Number group = 0;
    for (const BucketRow& row : report.buckets.rows)
      all.push_back({row.addr, row.group});
    for (const FreeBucketRow& row : report.freeBuckets.rows) {
      if (row.isFirst) group = row.group;
      free.emplace(row.addr.value, freeOrder.size());
      freeOrder.push_back({row.addr, group});
    }
  }

  struct Neighbours {
    Address next, prev;
  };

  Neighbours InAll(std::size_t place) const { return Around(all, place); }
  std::optional<Neighbours> InFree(Address addr) const {
    const auto found = free.find(addr.value);
    if (found == free.end()) return std::nullopt;
    return Around(freeOrder, found->second);
  }

private:
  struct Place {
    Address addr;
    Number group;
  };

  static Neighbours Around(const std::vector<Place>& places, std::size_t i) {
    const auto in = [&](std::size_t j) {
      return j < places.size() && places[j].group == places[i].group ? places[j].addr : Address{};
    };
    return {in(i + 1), i > 0 ? in(i - 1) : Address{}};
  }

  std::vector<Place> all, freeOrder;
  std::map<std::uint64_t, std::size_t> free; ///< by address, its place in freeOrder
};

/// A bucket's report against the pool's tables.
void CheckPlace(const Report& report, std::size_t i, const Lists& lists, const BucketCheck& check,
                Checker& checker) {
  const BucketReport& bucket = report.bucketReports[i];
  const BucketRow& row = report.buckets.rows[i];
  const auto line = [&](const char* label) { return check.Line(label); };
  const Lists::Neighbours inAll = lists.InAll(i);
  checker.Equal(line(BucketLabel::addr), "Addr", bucket.addr, row.addr, "Addr in BUCKETS");
  checker.Equal(line(BucketLabel::sizeofBucket), "Sizeof", bucket.sizeofBucket, report.sizeofBucket,
                "Sizeof Buck");
  checker.Equal(line(BucketLabel::next1), "Next1", bucket.next1, inAll.next,
                "the next bucket of its group in BUCKETS");
  checker.Equal(line(BucketLabel::prev1), "Prev1", bucket.prev1, inAll.prev,
                "the bucket of its group in front of it in BUCKETS");
  if (const auto inFree = lists.InFree(bucket.addr)) {
    checker.Equal(line(BucketLabel::next2), "Next2", bucket.next2, inFree->next,
                  "the next bucket of its group in FREE BUCKETS");
    checker.Equal(line(BucketLabel::prev2), "Prev2", bucket.prev2, inFree->prev,
                  "the bucket of its group in front of it in FREE BUCKETS");
  }
  checker.Equal(line(BucketLabel::recSize), "Recs Size", bucket.recSize, row.recSize,
                "Rec Size in BUCKETS");
  checker.Equal(line(BucketLabel::totalRecs), "Total Recs", bucket.totalRecs, row.total,
                "Total in BUCKETS");
  checker.Equal(line(BucketLabel::usedRecs), "Used Recs", bucket.usedRecs, row.used,
                "Used in BUCKETS");
  checker.Equal(line(BucketLabel::freeRecs), "Free Recs", bucket.freeRecs, row.free,
                "Free in BUCKETS");
}

} // namespace

void CheckBuckets(const Report& report, Checker& checker) {
  const Lists lists(report);
  std::map<Number, Address> parents;
  for (std::size_t i = 0; i < report.bucketReports.size(); ++i) {
    const BucketReport& bucket = report.bucketReports[i];
    checker.Equal(bucket.line, "the number in the title", bucket.number, i + 1, "Id in BUCKETS");
    BucketCheck check(bucket, checker);
    check.Run(report.sizeofHeader);
    if (i >= report.buckets.rows.size()) {
      checker.Add(bucket.line, "the bucket has no row in BUCKETS");
      continue;
    }
    CheckPlace(report, i, lists, check, checker);
    const Address parent =
        parents.emplace(report.buckets.rows[i].group, bucket.parent).first->second;
    checker.Equal(check.Line(BucketLabel::parent), "Parent", bucket.parent, parent,
                  "Parent of the buckets of its group");
  }
}

} // namespace VOK::MemPool::Tools
