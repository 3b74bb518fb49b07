#include "picture/Data.h"

#include "report/Check.h"
#include "report/Form.h"
#include "report/Summary.h"

#include <algorithm>
#include <bit>
#include <deque>
#include <fmt/format.h>
#include <map>
#include <nlohmann/json.hpp>
#include <optional>
#include <set>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

using Json = nlohmann::ordered_json;

/// A bit stream as a short text, six bits per character, for a page that holds millions of records.
/// data.js reads it.
class Bits {
public:
  /// The lowest `width` bits, the highest of them first.
  void Put(std::uint64_t value, int width) {
    for (int bit = width - 1; bit >= 0; --bit) {
      digit = digit * 2 + (value >> bit & 1);
      if (++filled == 6) Flush();
    }
  }

  std::string Take() {
    while (filled != 0)
      Put(0, 1);
    return std::move(text);
  }

private:
  void Flush() {
    constexpr char digits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    text += digits[digit];
    digit = 0;
    filled = 0;
  }

  std::string text;
  std::size_t digit = 0;
  int filled = 0;
};

/// Each record's type and, of a free one, its next offset. A used record takes one bit. A free one
/// of n records takes three or four if its next is a neighbour, as in a bucket that was allocated
/// or freed in order, and otherwise 2 bits and those of n:
///
///     0                 used
///     11 index          free, next is that record; n at the end of the list
///     101               free, next is the record after it
///     1001              free, next is the record before it
///     10001 32 bits     free, and next is no record's offset
///     100001            EXT
///     100000            UNKN
class RecordWriter {
public:
  explicit RecordWriter(const BucketReport& bucket_)
      : bucket(bucket_), count(bucket_.records.rows.size()),
        width(static_cast<int>(std::bit_width(count))) {}

  std::string Write() {
    for (std::size_t i = 0; i < count; ++i)
      Record(i);
    return bits.Take();
  }

private:
  void Record(std::size_t i) {
    switch (bucket.records.rows[i].type) {
    case Type::Used:
      return bits.Put(0, 1);
    case Type::Free:
      return Link(i, i < bucket.map.boxes.size() ? bucket.map.boxes[i].number : 0);
    case Type::Ext:
      return bits.Put(0b100001, 6);
    case Type::Unknown:
      return bits.Put(0b100000, 6);
    }
  }

  void Link(std::size_t i, Number next) {
    const std::size_t index = IndexOf(next);
    if (index > count) {
      bits.Put(0b10001, 5);
      bits.Put(next, 32);
    } else if (index == count || (index != i + 1 && index + 1 != i)) {
      bits.Put(0b11, 2);
      bits.Put(index, width);
    } else if (index == i + 1) {
      bits.Put(0b101, 3);
    } else {
      bits.Put(0b1001, 4);
    }
  }

  /// The record at an offset, `count` for offset 0 and more for what is no record's offset.
  std::size_t IndexOf(Number offset) const {
    if (offset == 0) return count;
    const Number size = bucket.recSize;
    if (offset < 2 || size == 0 || (offset - 2) % size != 0) return count + 1;
    const std::size_t index = (offset - 2) / size;
    return index < count ? index : count + 1;
  }

  const BucketReport& bucket;
  const std::size_t count;
  const int width;
  Bits bits;
};

/// One bit per flag.
std::string FlagBits(const std::vector<bool>& flags) {
  Bits bits;
  for (const bool flag : flags)
    bits.Put(flag ? 1 : 0, 1);
  return bits.Take();
}

/// An item of an earlier and of a later report; it came or went if one of them lacks it.
template <class Item>
struct Pair {
  const Item* before = nullptr;
  const Item* now = nullptr;

  const Item& Get() const { return now != nullptr ? *now : *before; }
  const char* Change() const { return before == nullptr ? "came" : now == nullptr ? "went" : ""; }
};

/// The items of `now` in their order, each with the one of `before` that has the same key, and then
/// the rest of `before`. Of equal keys the first belongs to the first.
template <class Item, class KeyOf>
std::vector<Pair<Item>> Match(const std::vector<Item>& before, const std::vector<Item>& now,
                              KeyOf keyOf) {
  std::map<decltype(keyOf(now.front())), std::deque<const Item*>> byKey;
  for (const Item& item : before)
    byKey[keyOf(item)].push_back(&item);
  std::set<const Item*> matched;
  std::vector<Pair<Item>> pairs;
  for (const Item& item : now) {
    pairs.push_back({nullptr, &item});
    const auto found = byKey.find(keyOf(item));
    if (found == byKey.end() || found->second.empty()) continue;
    pairs.back().before = found->second.front();
    matched.insert(found->second.front());
    found->second.pop_front();
  }
  for (const Item& item : before)
    if (!matched.contains(&item)) pairs.push_back({&item, nullptr});
  return pairs;
}

std::string HexOf(Address address) { return fmt::format("{:x}", address.value); }

const Report& OrNone(const Report* report) {
  static const Report none;
  return report != nullptr ? *report : none;
}

/// Visits a header block for its labels and values.
struct HeaderLines {
  Json lines = Json::array();

  void Line(const char* label, const char*, const std::string& text) { Add(label, text); }
  void Line(const char* label, const char*, Number number) { Add(label, fmt::to_string(number)); }
  void Line(const char* label, const char*, Address address) { Add(label, "0x" + HexOf(address)); }

private:
  void Add(std::string_view label, const std::string& value) {
    const std::size_t begin = label.find_first_not_of(' ');
    lines.push_back({label.substr(begin, label.find_last_not_of(" :") + 1 - begin), value});
  }
};

/// The inconsistencies of a report, and the records that they are about.
class Faults {
public:
  explicit Faults(const Report& report) {
    for (const BucketReport& bucket : report.bucketReports)
      flags.emplace_back(bucket.records.rows.size());
    for (const Inconsistency& inconsistency : CheckReport(report))
      Take(inconsistency);
  }

  /// A flag for each damaged record, nothing if there is none.
  std::string BitsOf(std::size_t bucket) const {
    const std::vector<bool>& of = flags[bucket];
    return std::find(of.begin(), of.end(), true) == of.end() ? "" : FlagBits(of);
  }

  Json list = Json::array(); ///< the first of them: line, bucket and record (or null), text
  std::size_t count = 0;

private:
  static constexpr std::size_t most = 500; // a page isn't there to list more

  void Take(const Inconsistency& inconsistency) {
    const auto& [line, bucket, record] = inconsistency.place;
    if (record) flags[*bucket][*record] = true;
    if (++count <= most)
      list.push_back({line, IndexOrNull(bucket), IndexOrNull(record), inconsistency.text});
  }

  static Json IndexOrNull(const std::optional<std::size_t>& index) {
    return index ? Json(*index) : Json();
  }

  std::vector<std::vector<bool>> flags; ///< by bucket and record
};

std::vector<bool> UsedIn(const BucketReport& bucket) {
  std::vector<bool> used;
  for (const RecordRow& row : bucket.records.rows)
    used.push_back(row.type == Type::Used);
  return used;
}

/// The buckets, a list for each of their values.
class Buckets {
public:
  explicit Buckets(bool isPair_) : isPair(isPair_) {
    for (const char* const key :
         {"id", "group", "used", "free", "recSize", "addr", "head", "count", "records", "damaged"})
      columns[key] = Json::array();
    if (!isPair) return;
    for (const char* const key : {"change", "before", "came", "went"})
      columns[key] = Json::array();
  }

  void Add(const Report& report, const BucketReport& bucket, const std::string& damaged) {
    const auto i = static_cast<std::size_t>(&bucket - report.bucketReports.data());
    Put("id", bucket.number);
    Put("group", i < report.buckets.rows.size() ? report.buckets.rows[i].group : 0);
    Put("used", bucket.usedRecs);
    Put("free", bucket.freeRecs);
    Put("recSize", bucket.recSize);
    Put("addr", HexOf(bucket.addr));
    Put("head", bucket.freeHead);
    Put("count", bucket.records.rows.size());
    Put("records", RecordWriter(bucket).Write());
    Put("damaged", damaged);
  }

  void AddChange(const Pair<BucketReport>& pair) {
    if (!isPair) return;
    const std::vector<bool> now = pair.now != nullptr ? UsedIn(*pair.now) : std::vector<bool>();
    const std::vector<bool> before =
        pair.before != nullptr ? UsedIn(*pair.before) : std::vector<bool>();
    std::size_t came = 0;
    std::size_t went = 0;
    for (std::size_t i = 0; i < std::max(now.size(), before.size()); ++i) {
      const bool isUsed = i < now.size() && now[i];
      const bool wasUsed = i < before.size() && before[i];
      came += isUsed && !wasUsed ? 1 : 0;
      went += wasUsed && !isUsed ? 1 : 0;
    }
    Put("change", pair.Change());
    Put("before", FlagBits(before));
    Put("came", came);
    Put("went", went);
  }

  Json columns = Json::object();

private:
  template <class Value>
  void Put(const char* key, const Value& value) {
    columns[key].push_back(value);
  }

  const bool isPair;
};

/// One pool of the page.
class PoolData {
public:
  PoolData(const Pair<Report>& pair_, bool isPair_)
      : pair(pair_), report(pair_.Get()), isPair(isPair_) {}

  Json Get() const {
    HeaderLines header;
    VisitLines(report, header);
    const Bytes bytes = BytesOf(report);
    Json json = {{"name", report.name},
                 {"line", report.line},
                 {"change", isPair ? pair.Change() : ""},
                 {"used", report.usedRecs},
                 {"free", report.freeRecs},
                 {"off", report.IsOff()},
                 {"held", bytes.held},
                 {"payload", bytes.payload},
                 {"sizeofBucket", report.sizeofBucket},
                 {"sizeofHeader", report.sizeofHeader},
                 {"bucketSize", report.bucketSize},
                 {"header", header.lines}};
    json["histogram"] = Histogram();
    json["ext"] = Ext();
    const Faults faults(report);
    json["buckets"] = Records(faults);
    json["faults"] = faults.list;
    json["numFaults"] = faults.count;
    return json;
  }

private:
  /// Size, frequency, and in a pair the earlier frequency.
  Json Histogram() const {
    const auto matched = Match(OrNone(pair.before).histogram.rows, OrNone(pair.now).histogram.rows,
                               [](const SizeRow& row) { return row.size; });
    Json rows = Json::array();
    for (const Pair<SizeRow>& row : matched) {
      rows.push_back({row.Get().size, row.now != nullptr ? row.now->freq : 0});
      if (isPair) rows.back().push_back(row.before != nullptr ? row.before->freq : 0);
    }
    std::sort(rows.begin(), rows.end());
    return rows;
  }

  /// Length, data address, and in a pair the change.
  Json Ext() const {
    const auto matched =
        Match(OrNone(pair.before).extRecs.rows, OrNone(pair.now).extRecs.rows,
              [](const ExtRow& row) { return std::pair(row.data.value, row.length); });
    Json rows = Json::array();
    for (const Pair<ExtRow>& row : matched) {
      rows.push_back({row.Get().length, HexOf(row.Get().data)});
      if (isPair) rows.back().push_back(row.Change());
    }
    return rows;
  }

  Json Records(const Faults& faults) const {
    Buckets buckets(isPair);
    const auto matched = Match(
        OrNone(pair.before).bucketReports, OrNone(pair.now).bucketReports,
        [](const BucketReport& bucket) { return std::pair(bucket.addr.value, bucket.recSize); });
    for (const Pair<BucketReport>& bucket : matched) {
      const Report& from = OrNone(bucket.now != nullptr ? pair.now : pair.before);
      const auto i = static_cast<std::size_t>(&bucket.Get() - from.bucketReports.data());
      buckets.Add(from, bucket.Get(), &from == &report ? faults.BitsOf(i) : "");
      buckets.AddChange(bucket);
    }
    return buckets.columns;
  }

  const Pair<Report>& pair;
  const Report& report;
  const bool isPair;
};

} // namespace

Json PictureData(const PictureSource* before, const PictureSource& now) {
  const bool isPair = before != nullptr;
  Json json = {{"files", Json::array()}, {"pools", Json::array()}};
  if (isPair) json["files"].push_back(before->name);
  json["files"].push_back(now.name);
  const std::vector<Report> none;
  const auto pools = Match(isPair ? before->reports : none, now.reports,
                           [](const Report& report) { return report.name; });
  for (const Pair<Report>& pool : pools)
    json["pools"].push_back(PoolData(pool, isPair).Get());
  return json;
}

} // namespace VOK::MemPool::Tools
