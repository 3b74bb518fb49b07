// The check of the buckets' reports: each against itself, its neighbours and the pool's tables.
#include "report/Check.h"
#include "report/Form.h"

#include <algorithm>
#include <map>

namespace VOK::MemPool::Tools {

namespace {

using Sum = std::uint64_t;

class BucketCheck {
public:
  BucketCheck(const Report& report, std::size_t index_, Checker& checker_)
      : bucket(report.bucketReports[index_]), index(index_),
        dataSize(bucket.recSize < report.sizeofHeader ? 0 : bucket.recSize - report.sizeofHeader),
        checker(checker_) {}

  void Run() {
    Header();
    Records();
    Histogram();
    CheckMap();
    FreeList();
  }

  Place AtLabel(const char* label) const { return At(LineOf(bucket, label)); }

private:
  Place At(std::size_t line) const { return {line, index}; }
  Place At(std::size_t line, std::size_t record) const { return {line, index, record}; }

  template <class Section>
  void CheckCount(const Section& section, std::size_t expected, std::string_view why) {
    checker.Equal(At(section.line), "the title's count", section.count, expected, why);
  }

  void Header() {
    const Address base{bucket.addr.value + bucket.sizeofBucket - 2};
    checker.Equal(AtLabel(BucketLabel::recsBase), "Recs Base", bucket.recsBase, base,
                  "Addr and Sizeof, less 2");
    checker.Equal(AtLabel(BucketLabel::recsBeg), "Recs Beg", bucket.recsBeg,
                  Address{base.value + 2}, "Addr and Sizeof");
    checker.Equal(AtLabel(BucketLabel::recsEnd), "Recs End", bucket.recsEnd,
                  Address{base.value + bucket.recsSize}, "Addr, Sizeof less 2, and Size");
    checker.Equal(AtLabel(BucketLabel::recsSize), "Size", bucket.recsSize,
                  2 + Sum{bucket.totalRecs} * bucket.recSize, "2 and Total Recs of Recs Size");
    checker.Equal(AtLabel(BucketLabel::usedRecs), "Used Recs + Free Recs",
                  Sum{bucket.usedRecs} + bucket.freeRecs, bucket.totalRecs, "Total Recs");
    checker.Equal(AtLabel(BucketLabel::usedBytes), "Used Bytes", bucket.usedBytes,
                  dataSize * bucket.usedRecs, "the data bytes of Used Recs");
    checker.Equal(AtLabel(BucketLabel::freeBytes), "Free Bytes", bucket.freeBytes,
                  dataSize * bucket.freeRecs, "the data bytes of Free Recs");
    if ((bucket.freeHead == 0) != (bucket.freeRecs == 0))
      checker.Add(AtLabel(BucketLabel::freeHead), "Free Head is 0 exactly where Free Recs is");
    checker.Equal(AtLabel(BucketLabel::headerOffset), "Hdr Offset", bucket.headerOffset,
                  bucket.sizeofBucket, "Sizeof");
    if (bucket.parent == Address{}) checker.Add(AtLabel(BucketLabel::parent), "Parent is null");
  }

  void Records() {
    const auto& table = bucket.records;
    CheckCount(table, table.rows.size(), "the number of rows");
    checker.Equal(At(table.line), "the number of rows", table.rows.size(), bucket.totalRecs,
                  "Total Recs");
    WarningOf(bucket.recordsWarning, table);
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const RecordRow& row = table.rows[i];
      const Place place = At(table.LineOf(i), i);
      checker.RowId(place, row.id.value, i);
      checker.Equal(place, "Offset", row.offset, 2 + Sum{i} * bucket.recSize, "the rows above");
      checker.Equal(place, "Size", row.size, bucket.recSize, "Recs Size");
      checker.Equal(place, "End", row.end, Sum{row.offset} + row.size, "Offset and Size");
      checker.Equal(place, "DSize", row.dataSize, row.type == Type::Used ? dataSize : 0,
                    "the data bytes of a used record");
      checker.Equal(place, "Address", row.addr, Address{bucket.recsBase.value + row.offset},
                    "Recs Base and Offset");
      if (row.type == Type::Ext || row.type == Type::Unknown)
        checker.Add(place, "Type is neither FREE nor USED");
      used += row.type == Type::Used ? 1 : 0;
      recordsByOffset.emplace(row.offset, i);
    }
    checker.Equal(At(table.line), "the number of USED rows", used, bucket.usedRecs, "Used Recs");
  }

  template <class Row>
  void WarningOf(const std::optional<Warning>& warning, const Table<Row>& table) {
    if (warning)
      checker.Add(At(table.LineOf(table.rows.size())), "the library warns of what it found");
  }

  void Histogram() {
    const auto& table = bucket.histogram;
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const BucketSizeRow& row = table.rows[i];
      const Place place = At(table.LineOf(i));
      checker.RowId(place, row.id.value, i);
      checker.Equal(place, "Size", row.size, dataSize, "the data bytes of a record");
      checker.Equal(place, "Freq", row.freq, used, "USED rows of ALL RECORDS");
      checker.Equal(place, "the bar", row.bar.stars, std::min<Number>(row.freq, maxStars / 2),
                    "Freq up to 50");
      if (row.bar.more != (row.freq > maxStars / 2))
        checker.Add(place, "the bar has a \"+\" exactly above 50");
    }
    CheckCount(table, bucket.usedRecs, "Used Recs");
    checker.Equal(At(table.line), "the number of rows", table.rows.size(), used > 0 ? 1 : 0,
                  "one where a record is used");
  }

  void CheckMap() {
    const Map& map = bucket.map;
    CheckCount(map, map.boxes.size(), "boxes");
    checker.Equal(At(map.line), "the number of boxes", map.boxes.size(), bucket.totalRecs,
                  "Total Recs");
    checker.Equal(At(map.line + 1), "the heading", map.columns,
                  std::min(bucket.records.rows.size(), Map::boxesPerRow),
                  "the rows of ALL RECORDS, up to 8");
    for (std::size_t i = 0; i < map.labels.size(); ++i)
      checker.Equal(At(map.LineOf(i * Map::boxesPerRow) + 2), "the row's label", map.labels[i],
                    i * Map::boxesPerRow, "the boxes before it");
    for (std::size_t i = 0; i < std::min(map.boxes.size(), bucket.records.rows.size()); ++i)
      CheckBox(i);
  }

  void CheckBox(std::size_t i) {
    const Box& box = bucket.map.boxes[i];
    const RecordRow& row = bucket.records.rows[i];
    const std::size_t line = bucket.map.LineOf(i);
    const std::string name = fmt::format("in the box of offset {}, ", row.offset);
    checker.Equal(At(line + 1, i), name + "o", box.offset, row.offset, "Offset in ALL RECORDS");
    checker.Equal(At(line + 2, i), name + "s", box.size, bucket.recSize, "Recs Size");
    if (box.type != row.type)
      checker.Add(At(line, i), name + "the type is not that of ALL RECORDS");
    if (box.isHead != (box.offset == bucket.freeHead))
      checker.Add(At(line, i), name + "\" +\" marks another record than Free Head");
    const char tag = row.type == Type::Free ? 'n' : row.type == Type::Used ? 'd' : 'u';
    if (box.tag != tag)
      checker.Add(At(line + 3, i), name + "the tag is not that of the type");
    else if (tag == 'n')
      nextByOffset.emplace(box.offset, box.number);
    else
      checker.Equal(At(line + 3, i), name + tag, box.number, tag == 'd' ? dataSize : 0,
                    "the data bytes of a used record");
  }

  void FreeList() {
    const auto& table = bucket.freeList;
    CheckCount(table, table.rows.size(), "the number of rows");
    checker.Equal(At(table.line), "the number of rows", table.rows.size(), bucket.freeRecs,
                  "Free Recs");
    WarningOf(bucket.freeListWarning, table);
    isListed.resize(bucket.records.rows.size());
    Number expected = bucket.freeHead;
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      CheckFree(i, expected);
      expected = table.rows[i].next;
    }
    if (expected != 0 && !bucket.freeListWarning)
      checker.Add(At(table.line), fmt::format("the list ends before offset {}", expected));
    for (const auto& [offset, record] : recordsByOffset)
      if (bucket.records.rows[record].type == Type::Free && !isListed[record])
        checker.Add(At(bucket.records.LineOf(record), record),
                    "Type is FREE, and FREE LIST lacks the record");
  }

  /// A row of the list, which should have this offset, against its row in the record table.
  void CheckFree(std::size_t i, Number offset) {
    const FreeRow& row = bucket.freeList.rows[i];
    const auto record = recordsByOffset.find(row.offset);
    Place place = At(bucket.freeList.LineOf(i));
    if (record != recordsByOffset.end()) place.record = record->second;
    checker.RowId(place, row.id.value, i);
    checker.Equal(place, "Offset", row.offset, offset, "Next of the row above, or Free Head");
    checker.Equal(place, "Size", row.size, bucket.recSize, "Recs Size");
    checker.Equal(place, "Address", row.addr, Address{bucket.recsBase.value + row.offset},
                  "Recs Base and Offset");
    checker.Equal(place, "Next Addr", row.nextAddr,
                  row.next == 0 ? Address{} : Address{bucket.recsBase.value + row.next},
                  "Recs Base and Next");
    const auto next = nextByOffset.find(row.offset);
    if (next != nextByOffset.end())
      checker.Equal(place, "Next", row.next, next->second, "n in the record's box of the map");
    if (!place.record || isListed[*place.record]) {
      checker.Add(place, "no record of ALL RECORDS has this Offset, or it is listed twice");
      return;
    }
    if (bucket.records.rows[*place.record].type != Type::Free)
      checker.Add(place, "the record's Type in ALL RECORDS is not FREE");
    isListed[*place.record] = true;
  }

  const BucketReport& bucket;
  const std::size_t index;
  const Sum dataSize;
  Checker& checker;
  Sum used = 0;                                  ///< USED rows
  std::map<Number, std::size_t> recordsByOffset; ///< index in ALL RECORDS
  std::vector<bool> isListed;                    ///< by record, whether FREE LIST has it
  std::map<Number, Number> nextByOffset;         ///< as the map shows it
};

/// The lists of a pool's buckets, as BUCKETS and FREE BUCKETS show them.
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
  const auto at = [&](const char* label) { return check.AtLabel(label); };
  const Lists::Neighbours inAll = lists.InAll(i);
  checker.Equal(at(BucketLabel::addr), "Addr", bucket.addr, row.addr, "Addr in BUCKETS");
  checker.Equal(at(BucketLabel::sizeofBucket), "Sizeof", bucket.sizeofBucket, report.sizeofBucket,
                "Sizeof Buck");
  checker.Equal(at(BucketLabel::next1), "Next1", bucket.next1, inAll.next,
                "the next bucket of its group in BUCKETS");
  checker.Equal(at(BucketLabel::prev1), "Prev1", bucket.prev1, inAll.prev,
                "the previous bucket of its group in BUCKETS");
  if (const auto inFree = lists.InFree(bucket.addr)) {
    checker.Equal(at(BucketLabel::next2), "Next2", bucket.next2, inFree->next,
                  "the next bucket of its group in FREE BUCKETS");
    checker.Equal(at(BucketLabel::prev2), "Prev2", bucket.prev2, inFree->prev,
                  "the previous bucket of its group in FREE BUCKETS");
  }
  checker.Equal(at(BucketLabel::recSize), "Recs Size", bucket.recSize, row.recSize,
                "Rec Size in BUCKETS");
  checker.Equal(at(BucketLabel::totalRecs), "Total Recs", bucket.totalRecs, row.total,
                "Total in BUCKETS");
  checker.Equal(at(BucketLabel::usedRecs), "Used Recs", bucket.usedRecs, row.used,
                "Used in BUCKETS");
  checker.Equal(at(BucketLabel::freeRecs), "Free Recs", bucket.freeRecs, row.free,
                "Free in BUCKETS");
}

} // namespace

void CheckBuckets(const Report& report, Checker& checker) {
  const Lists lists(report);
  std::map<Number, Address> parents;
  for (std::size_t i = 0; i < report.bucketReports.size(); ++i) {
    const BucketReport& bucket = report.bucketReports[i];
    checker.Equal({bucket.line, i}, "the number in the title", bucket.number, i + 1,
                  "Id in BUCKETS");
    BucketCheck check(report, i, checker);
    check.Run();
    if (i >= report.buckets.rows.size()) {
      checker.Add({bucket.line, i}, "the bucket has no row in BUCKETS");
      continue;
    }
    CheckPlace(report, i, lists, check, checker);
    const Address parent =
        parents.emplace(report.buckets.rows[i].group, bucket.parent).first->second;
    checker.Equal(check.AtLabel(BucketLabel::parent), "Parent", bucket.parent, parent,
                  "Parent of the buckets of its group");
  }
}

} // namespace VOK::MemPool::Tools
