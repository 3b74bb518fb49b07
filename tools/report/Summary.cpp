#include "report/Summary.h"

#include "common/Files.h"

#include <algorithm>
#include <fmt/format.h>
#include <map>
#include <nlohmann/json.hpp>
#include <set>
#include <string_view>

namespace VOK::MemPool::Tools {

Bytes BytesOf(const Report& report) {
  // Five pointers and 8 bytes are the header of a bucket, two pointers and 8 bytes that of an ext
  // record.
  const std::uint64_t pointer = (std::max<Number>(report.sizeofBucket, 8) - 8) / 5;
  Bytes bytes;
  for (const BucketRow& row : report.buckets.rows) {
    bytes.held += report.sizeofBucket + std::uint64_t{row.total} * row.recSize;
    if (row.recSize > report.sizeofHeader)
      bytes.payload += std::uint64_t{row.used} * (row.recSize - report.sizeofHeader);
  }
  for (const ExtRow& row : report.extRecs.rows) {
    bytes.held += 2 * pointer + 8 + row.length;
    bytes.payload += row.length;
  }
  return bytes;
}

std::string Summarise(const std::vector<Report>& reports, const std::vector<std::string>& marks) {
  constexpr auto form = "{}{:<{}} {:>10} {:>10} {:>10} {:>13} {:>13} {:>8}{}\n";
  constexpr auto lineForm = "{:>10} ";
  std::size_t width = 4;
  std::set<std::string_view> names;
  for (const Report& report : reports) {
    width = std::max(width, OneLine(report.name).size());
    names.insert(report.name);
  }
  const bool hasLines = names.size() < reports.size();
  std::string text = fmt::format(form, hasLines ? fmt::format(lineForm, "line") : "", "pool", width,
                                 "used", "free", "ext", "bytes held", "payload", "share", "");
  for (std::size_t i = 0; i < reports.size(); ++i) {
    const Report& report = reports[i];
    const Bytes bytes = BytesOf(report);
    const std::string share =
        bytes.held == 0 ? "-"
                        : fmt::format("{:.1f} %", static_cast<double>(bytes.payload) * 100.0 /
                                                      static_cast<double>(bytes.held));
    text += fmt::format(form, hasLines ? fmt::format(lineForm, report.line) : "",
                        OneLine(report.name), width, report.usedRecs, report.freeRecs,
                        report.numExtRecs, bytes.held, bytes.payload, share,
                        (report.IsOff() ? " off" : "") + (marks.empty() ? "" : marks[i]));
  }
  return text;
}

namespace {

struct Metric {
  const char* name;
  const char* title;
  std::uint64_t (*get)(const Report& report);
};

constexpr Metric metrics[] = {
    {"used_records", "Used records in buckets",
     [](const Report& r) { return std::uint64_t{r.usedRecs}; }},
    {"free_records", "Free records in buckets",
     [](const Report& r) { return std::uint64_t{r.freeRecs}; }},
    {"ext_records", "Large records, blocks of their own",
     [](const Report& r) { return std::uint64_t{r.numExtRecs}; }},
    {"buckets", "Buckets", [](const Report& r) { return std::uint64_t{r.numBuckets}; }},
    {"empty_buckets", "Buckets without a used record",
     [](const Report& r) { return std::uint64_t{r.empty}; }},
    {"full_buckets", "Buckets without a free record",
     [](const Report& r) { return std::uint64_t{r.full}; }},
    {"held_bytes", "Bytes of the heap in buckets and large records",
     [](const Report& r) { return BytesOf(r).held; }},
    {"payload_bytes", "Data bytes of used records",
     [](const Report& r) { return BytesOf(r).payload; }},
    {"enabled", "1 if pooling is on", [](const Report& r) { return std::uint64_t{r.enabled}; }},
};

std::string Escaped(std::string_view text, std::string_view special, std::string_view escape) {
  std::string escaped;
  for (const char c : text)
    if (c == '\n' && escape == "\\")
      escaped += "\\n";
    else
      escaped.append(special.find(c) == std::string_view::npos ? "" : escape) += c;
  return escaped;
}

} // namespace

std::string PrometheusText(const std::vector<Report>& reports) {
  std::map<std::string, const Report*> last;
  for (const Report& report : reports)
    last[report.name] = &report;
  std::string text;
  for (const Metric& metric : metrics) {
    text += fmt::format("# HELP vokmempool_{0} {1}\n# TYPE vokmempool_{0} gauge\n", metric.name,
                        metric.title);
    for (const auto& [name, report] : last)
      text += fmt::format("vokmempool_{}{{pool=\"{}\"}} {}\n", metric.name,
                          Escaped(name, "\\\"", "\\"), metric.get(*report));
  }
  return text;
}

std::string SeriesText(const std::vector<Report>& reports) {
  std::string text = "line,pool";
  for (const Metric& metric : metrics)
    text += fmt::format(",{}", metric.name);
  text += '\n';
  for (const Report& report : reports) {
    text += fmt::format("{},\"{}\"", report.line, Escaped(report.name, "\"", "\""));
    for (const Metric& metric : metrics)
      text += fmt::format(",{}", metric.get(report));
    text += '\n';
  }
  return text;
}

std::string SeriesJson(const std::vector<Report>& reports) {
  using Json = nlohmann::ordered_json;
  Json rows = Json::array();
  for (const Report& report : reports) {
    Json& row = rows.emplace_back(Json{{"line", report.line}, {"pool", report.name}});
    for (const Metric& metric : metrics)
      row[metric.name] = metric.get(report);
  }
  return rows.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
}

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

std::string SizesOf(const PoolFigures& before, const PoolFigures& now) {
  std::string text;
  ForEachPair(before.bySize, now.bySize, [&](Number size, const Figures* was, const Figures* is) {
    const std::string change =
        TextOf(was != nullptr ? *was : Figures(), is != nullptr ? *is : Figures());
    if (!change.empty()) text += fmt::format("  records of {} bytes: {}\n", size, change);
  });
  return text;
}

/// Null for a pool that isn't there; empty if nothing differs.
std::string PoolDifference(const std::string& name, const PoolFigures* before,
                           const PoolFigures* now, bool showsRecords) {
  static const PoolFigures none;
  const PoolFigures& a = before != nullptr ? *before : none;
  const PoolFigures& b = now != nullptr ? *now : none;
  const std::string change = TextOf(a.all, b.all);
  const std::string parts = SizesOf(a, b) + (showsRecords ? RecordsOf(a, b) : "");
  const bool stays = before != nullptr && now != nullptr;
  if (stays && change.empty() && parts.empty()) return {};
  const char* const what = before == nullptr         ? "came"
                           : now == nullptr          ? "went"
                           : b.all.held > a.all.held ? "grew"
                           : b.all.held < a.all.held ? "shrank"
                                                     : "changed";
  return fmt::format("{} {}{}{}\n{}", OneLine(name), what, change.empty() ? "" : ": ", change,
                     parts);
}

} // namespace

std::string Difference(const std::vector<Report>& before, const std::vector<Report>& now,
                       bool showsRecords) {
  std::string text;
  ForEachPair(ByName(before), ByName(now),
              [&](const std::string& name, const PoolFigures* old, const PoolFigures* young) {
                text += PoolDifference(name, old, young, showsRecords);
              });
  return text;
}

} // namespace VOK::MemPool::Tools
