#include "report/Summary.h"

#include "common/Files.h"

#include <algorithm>
#include <fmt/format.h>
#include <map>

namespace VOK::MemPool::Tools {

namespace {

struct Figures {
  std::uint64_t used = 0, free = 0, buckets = 0, held = 0, payload = 0;
};

/// The figures of a pool, those of its buckets by record size, and the used records by address.
struct PoolFigures {
  Figures all;
  std::map<Number, Figures> bySize;
  std::map<std::uint64_t, Number> records;
};

/// Ext records count as used ones, without a bucket. A record is where its data is.
PoolFigures FiguresOf(const Report& report) {
  PoolFigures figures;
  const Bytes bytes = BytesOf(report);
  figures.all = {report.usedRecs + report.numExtRecs, report.freeRecs, report.numBuckets,
                 bytes.held, bytes.payload};
  for (const BucketRow& row : report.buckets.rows) {
    Figures& size = figures.bySize[row.recSize];
    size.used += row.used;
    size.free += row.free;
    ++size.buckets;
  }
  for (const BucketReport& bucket : report.bucketReports)
    for (const RecordRow& row : bucket.records.rows)
      if (row.type == Type::Used)
        figures.records[row.addr.value + report.sizeofHeader] = row.dataSize;
  for (const ExtRow& row : report.extRecs.rows)
    figures.records[row.data.value] = row.length;
  return figures;
}

std::string ChangeOf(std::uint64_t before, std::uint64_t now) {
  return now < before ? fmt::format("-{}", before - now) : fmt::format("+{}", now - before);
}

/// The figures that differ.
std::string TextOf(const Figures& before, const Figures& now) {
  std::string text;
  const auto add = [&](const char* what, std::uint64_t Figures::*figure) {
    if (before.*figure != now.*figure)
      text += fmt::format("{}{} {}", text.empty() ? "" : ", ", what,
                          ChangeOf(before.*figure, now.*figure));
  };
  add("used", &Figures::used);
  add("free", &Figures::free);
  add("buckets", &Figures::buckets);
  add("bytes held", &Figures::held);
  add("payload", &Figures::payload);
  return text;
}

/// Calls `take(key, before, now)` for each key of either map, with null where one lacks it.
template <class Key, class Value, class Take>
void ForEachPair(const std::map<Key, Value>& before, const std::map<Key, Value>& now, Take take) {
  auto old = before.begin();
  auto young = now.begin();
  while (old != before.end() || young != now.end()) {
    const bool isGone = young == now.end() || (old != before.end() && old->first < young->first);
    const bool isNew = old == before.end() || (young != now.end() && young->first < old->first);
    take(isGone ? old->first : young->first, isNew ? nullptr : &old->second,
         isGone ? nullptr : &young->second);
    if (!isNew) ++old;
    if (!isGone) ++young;
  }
}

std::string RecordsOf(const PoolFigures& before, const PoolFigures& now) {
  std::string text;
  ForEachPair(before.records, now.records,
              [&](std::uint64_t address, const Number* old, const Number* young) {
                if (old != nullptr && young != nullptr && *old == *young) return;
                if (old != nullptr)
                  text += fmt::format("  went: {} bytes at {:#x}\n", *old, address);
                if (young != nullptr)
                  text += fmt::format("  came: {} bytes at {:#x}\n", *young, address);
              });
  return text;
}

std::map<std::string, PoolFigures> ByName(const std::vector<Report>& reports) {
  std::map<std::string, PoolFigures> pools;
  for (const Report& report : reports)
    pools[report.name] = FiguresOf(report);
  return pools;
}

} // namespace

std::string Difference(const std::vector<Report>& before, const std::vector<Report>& now,
                       bool showsRecords) {
  static const PoolFigures none;
  std::string text;
  ForEachPair(
      ByName(before), ByName(now),
      [&](const std::string& name, const PoolFigures* old, const PoolFigures* young) {
        const PoolFigures& a = old != nullptr ? *old : none;
        const PoolFigures& b = young != nullptr ? *young : none;
        std::string sizes;
        ForEachPair(a.bySize, b.bySize, [&](Number size, const Figures* was, const Figures* is) {
          const std::string change =
              TextOf(was != nullptr ? *was : Figures(), is != nullptr ? *is : Figures());
          if (!change.empty()) sizes += fmt::format("  records of {} bytes: {}\n", size, change);
        });
        if (showsRecords) sizes += RecordsOf(a, b);
        const std::string change = TextOf(a.all, b.all);
        if (old != nullptr && young != nullptr && change.empty() && sizes.empty()) return;
        const char* const what = old == nullptr            ? "came"
                                 : young == nullptr        ? "went"
                                 : b.all.held > a.all.held ? "grew"
                                 : b.all.held < a.all.held ? "shrank"
                                                           : "changed";
        text += fmt::format("{} {}{}{}\n{}", OneLine(name), what, change.empty() ? "" : ": ",
                            change, sizes);
      });
  return text;
}

} // namespace VOK::MemPool::Tools
