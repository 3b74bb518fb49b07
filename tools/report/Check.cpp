// The check of a pool's header block, histogram and tables against each other.
#include "report/Check.h"

#include "common/Files.h"
#include "report/Form.h"

#include <algorithm>
#include <map>

namespace VOK::MemPool::Tools {

namespace {

using Sum = std::uint64_t;

class PoolCheck {
public:
  PoolCheck(const Report& report_, Checker& checker_) : report(report_), checker(checker_) {}

  void Run() {
    Header();
    Buckets();
    FreeBuckets();
    ExtRecs();
    Histogram();
  }

private:
  void Label(const char* label, Sum found, Sum expected, std::string_view why) {
    std::string name(label, std::string_view(label).find(':'));
    name.erase(name.find_last_not_of(' ') + 1);
    name.erase(0, name.find_first_not_of(' '));
    checker.Equal({LineOf(report, label)}, name, found, expected, why);
  }

  /// A row of BUCKETS.
  Place BucketRowAt(std::size_t i) const { return {report.buckets.LineOf(i), i}; }

  Sum DataSizeOf(Number recSize) const {
    return recSize < report.sizeofHeader ? 0 : recSize - report.sizeofHeader;
  }

  template <class Row>
  void CheckCount(const Table<Row>& table) {
    checker.Equal({table.line}, "the title's count", table.count, table.rows.size(),
                  "the number of rows");
  }

  void Header() {
    const auto count = [&](auto condition) {
      return static_cast<Sum>(
          std::count_if(report.buckets.rows.begin(), report.buckets.rows.end(), condition));
    };
    Sum used = 0;
    Sum free = 0;
    for (const BucketRow& row : report.buckets.rows) {
      used += row.used;
      free += row.free;
    }
    Label(PoolLabel::numBuckets, report.numBuckets, report.buckets.rows.size(), "rows of BUCKETS");
    Label(PoolLabel::empty, report.empty, count([](auto& row) { return row.free == row.total; }),
          "rows of BUCKETS with Free as Total");
    Label(PoolLabel::full, report.full, count([](auto& row) { return row.free == 0; }),
          "rows of BUCKETS with Free 0");
    Label(PoolLabel::usedRecs, report.usedRecs, used, "the sum of Used in BUCKETS");
    Label(PoolLabel::extRecs, report.numExtRecs, report.extRecs.rows.size(), "rows of EXT RECS");
    Label(PoolLabel::freeRecs, report.freeRecs, free, "the sum of Free in BUCKETS");
    Label(PoolLabel::freeBucks, report.freeBucks, count([](auto& row) { return row.free > 0; }),
          "rows of BUCKETS with Free above 0");
    Label(PoolLabel::sizeofFree, report.sizeofFree, report.sizeofHeader, "Sizeof Hdr");
    Label(PoolLabel::sizeofUsed, report.sizeofUsed, report.sizeofHeader, "Sizeof Hdr");
    if (report.dataAlignment > 0 && report.minRecSize <= report.maxRecSize)
      Label(PoolLabel::numGroups, report.numGroups,
            Sum{report.maxRecSize - report.minRecSize} / report.dataAlignment + 1,
            "the steps of Data Align from Min Rec Sz to Max Rec Sz, and 1");
    else
      checker.Add({LineOf(report, PoolLabel::dataAlignment)},
                  "no size class lies between these sizes");
    if (report.enabled > 1)
      checker.Add({LineOf(report, PoolLabel::enabled)}, "Enabled is neither 0 nor 1");
    if (report.enabled == 0 && !(report.buckets.rows.empty() && report.extRecs.rows.empty()))
      checker.Add({LineOf(report, PoolLabel::enabled)},
                  "Enabled is 0, and the pool has buckets or ext records");
  }

  void Buckets() {
    CheckCount(report.buckets);
    const BucketRow* before = nullptr;
    for (std::size_t i = 0; i < report.buckets.rows.size(); ++i) {
      const BucketRow& row = report.buckets.rows[i];
      const Place place = BucketRowAt(i);
      checker.RowId(place, row.id, i);
      checker.Equal(place, "Used + Free", Sum{row.used} + row.free, row.total, "Total");
      checker.Equal(place, "% Used in thousandths", row.percent.thousandths, PercentOf(row),
                    "Used of Total");
      if (report.dataAlignment > 0)
        checker.Equal(place, "Group", row.group,
                      (std::max(row.recSize, report.minRecSize) - report.minRecSize) /
                          report.dataAlignment,
                      "the size class of Rec Size");
      if (row.group >= report.numGroups) checker.Add(place, "Group is not below Num Groups");
      if (row.recSize > 0 && report.bucketSize >= 2)
        checker.Equal(place, "Total", row.total, (report.bucketSize - 2) / row.recSize,
                      "what Bucket Size has room for");
      if (before != nullptr && row.group < before->group)
        checker.Add(place, "Group is below that of the row above");
      if (!bucketsByAddr.emplace(row.addr.value, i).second)
        checker.Add(place, "Addr is that of another row");
      before = &row;
    }
  }

  static Sum PercentOf(const BucketRow& row) {
    if (row.total == 0) return 0;
    std::string text = fmt::format("{:.3f}", row.used * 100.0 / row.total);
    text.erase(text.size() - 4, 1);
    return std::stoull(text);
  }

  void FreeBuckets() {
    const auto& table = report.freeBuckets;
    CheckCount(table);
    checker.Equal({table.line}, "the title's second number", report.freeBucketsM, report.freeBucksM,
                  "Free BucksM");
    if (!report.buckets.rows.empty() &&
        report.freeBucksM < DataSizeOf(report.buckets.rows.back().recSize))
      checker.Add({LineOf(report, PoolLabel::freeBucksM)},
                  "Free BucksM is below the data size of the last row of BUCKETS");
    Number groups = 0;
    const FreeBucketRow* first = nullptr;
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const FreeBucketRow& row = table.rows[i];
      const Place place{table.LineOf(i)};
      if (row.isFirst) {
        checker.Equal(place, "Id", row.id, ++groups, "ids have no gap");
        const auto isFirst = [](const FreeBucketRow& other) { return other.isFirst; };
        const auto end = std::find_if(table.rows.begin() + static_cast<std::ptrdiff_t>(i) + 1,
                                      table.rows.end(), isFirst);
        checker.Equal(place, "Count", row.count, static_cast<Sum>(end - table.rows.begin()) - i,
                      "rows of this group");
        if (first != nullptr && row.group <= first->group)
          checker.Add(place, "Group is not above that of the previous group");
        first = &row;
      }
      if (first == nullptr) {
        checker.Add(place, "the first row lacks its group");
        continue;
      }
      checker.Equal(place, "Off", row.off, static_cast<Sum>(&row - first),
                    "its place in the group");
      FreeBucket(place, *first, row);
    }
    for (const auto& [addr, i] : bucketsByAddr)
      if (report.buckets.rows[i].free > 0)
        checker.Add(BucketRowAt(i), "Free is above 0, and FREE BUCKETS lacks the bucket");
  }

  /// A row of FREE BUCKETS against its row in BUCKETS, which is taken out of the map.
  void FreeBucket(Place place, const FreeBucketRow& first, const FreeBucketRow& row) {
    const auto found = bucketsByAddr.find(row.addr.value);
    if (found == bucketsByAddr.end()) {
      checker.Add(place, "the bucket is not in BUCKETS, or is listed twice");
      return;
    }
    place.bucket = found->second;
    const BucketRow& bucket = report.buckets.rows[found->second];
    checker.Equal(place, "Group", first.group, bucket.group, "the bucket's Group in BUCKETS");
    checker.Equal(place, "Size", first.size, DataSizeOf(bucket.recSize),
                  "the bucket's Rec Size without the record's header");
    if (bucket.free == 0) checker.Add(place, "the bucket's Free in BUCKETS is 0");
    bucketsByAddr.erase(found);
  }

  void ExtRecs() {
    CheckCount(report.extRecs);
    const std::vector<ExtRow>& rows = report.extRecs.rows;
    for (std::size_t i = 0; i < rows.size(); ++i) {
      const Place place{report.extRecs.LineOf(i)};
      checker.RowId(place, rows[i].id, i);
      const Address next = i + 1 < rows.size() ? rows[i + 1].heap : Address{};
      const Address prev = i > 0 ? rows[i - 1].heap : Address{};
      checker.Equal(place, "Next", rows[i].next, next, "Heap Ptr of the row below");
      checker.Equal(place, "Prev", rows[i].prev, prev, "Heap Ptr of the row above");
      checker.Equal(place, "Data Ptr", rows[i].data, Address{rows[i].heap.value + ExtHeader()},
                    "Heap Ptr and the block's header");
      if (rows[i].length > report.maxExtSize) checker.Add(place, "Length is above Max Ext Sz");
      if (RecSizeOf(rows[i].length) <= report.maxRecSize)
        checker.Add(place, "Length would have fit in a bucket");
    }
  }

  /// The record that a bucket would have for a request.
  Sum RecSizeOf(Sum size) const {
    const Sum multiple = std::max<Number>(report.dataAlignment, 1);
    return (std::max<Sum>(size, 1) - 1) / multiple * multiple + multiple + report.sizeofHeader;
  }

  /// Two pointers and 8 bytes; the header of a bucket is five pointers and 8 bytes.
  Sum ExtHeader() const {
    return report.sizeofBucket < 8 ? 0 : (report.sizeofBucket - 8) / 5 * 2 + 8;
  }

  void Histogram() {
    const auto& table = report.histogram;
    CheckCount(table);
    std::map<Sum, Sum> expected;
    for (const BucketRow& row : report.buckets.rows)
      if (row.used > 0) expected[DataSizeOf(row.recSize)] += row.used;
    for (const ExtRow& row : report.extRecs.rows)
      ++expected[row.length];
    Number peak = 0;
    for (const SizeRow& row : table.rows)
      peak = std::max(peak, row.freq);
    const Number scale = std::max<Number>(peak / (maxStars / 2), 1);
    for (std::size_t i = 0; i < table.rows.size(); ++i) {
      const SizeRow& row = table.rows[i];
      const Place place{table.LineOf(i)};
      checker.RowId(place, row.id, i);
      if (i > 0 && row.size <= table.rows[i - 1].size)
        checker.Add(place, "Size is not above that of the row above");
      checker.Equal(place, "Freq", row.freq, expected[row.size],
                    "used records of this size in BUCKETS and EXT RECS");
      checker.Equal(place, "the bar", row.bar.stars, Sum{row.freq} / scale + 1, "Freq to scale");
      if (row.bar.more) checker.Add(place, "the bar has a \"+\"");
      expected.erase(row.size);
    }
    for (const auto& [size, freq] : expected)
      checker.Add({table.line},
                  fmt::format("there is no row for the {} records of {} bytes", freq, size));
  }

  const Report& report;
  Checker& checker;
  std::map<std::uint64_t, std::size_t> bucketsByAddr; ///< index in BUCKETS
};

} // namespace

std::vector<Inconsistency> CheckReport(const Report& report) {
  Checker checker;
  PoolCheck(report, checker).Run();
  CheckBuckets(report, checker);
  std::stable_sort(
      checker.found.begin(), checker.found.end(),
      [](const Inconsistency& a, const Inconsistency& b) { return a.place.line < b.place.line; });
  return checker.found;
}

namespace {

std::string Counted(std::size_t count) {
  return count == 0   ? ""
         : count == 1 ? "1 inconsistency"
                      : fmt::format("{} inconsistencies", count);
}

} // namespace

std::string CountInconsistencies(const std::vector<Report>& reports) {
  std::size_t count = 0;
  for (const Report& report : reports)
    count += CheckReport(report).size();
  return Counted(count);
}

std::string PrintInconsistencies(const std::vector<Report>& reports) {
  std::size_t count = 0;
  for (const Report& report : reports)
    for (const Inconsistency& inconsistency : CheckReport(report)) {
      Print(fmt::format("line {}: {}\n", inconsistency.place.line, inconsistency.text));
      ++count;
    }
  if (count == 0)
    Print(fmt::format("{} report{}, no contradiction\n", reports.size(),
                      reports.size() == 1 ? "" : "s"));
  return Counted(count);
}

} // namespace VOK::MemPool::Tools
