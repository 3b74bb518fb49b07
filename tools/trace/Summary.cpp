#include "trace/Summary.h"

#include <algorithm>
#include <fmt/format.h>
#include <nlohmann/json.hpp>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t shown = 20; // rows of a section that would be long

std::string LineText(LineNumber line) {
  return line == 0 ? "not in the trace" : fmt::format("line {}", line);
}

/// The first items, and the number of those that aren't shown.
template <class Items, class Form>
std::string Section(std::string_view title, const Items& items, std::uint64_t count, Form form) {
  std::string text = fmt::format("\n{} ({})\n", title, count);
  std::size_t rows = 0;
  for (const auto& item : items) {
    if (rows == shown) break;
    text += fmt::format("  {}\n", form(item));
    ++rows;
  }
  if (rows < count) text += fmt::format("  and {} more: --json has them\n", count - rows);
  return text;
}

std::string LineNameOf(const PoolNames& names, const PoolId& pool) {
  return OneLine(NameOf(names, pool));
}

std::string PoolText(const TracedPool& pool, const PoolNames& names, std::string_view left) {
  std::string text = fmt::format(
      "{}: construction {}, requests {}, freed {}, peak {} bytes, {} {} records of {} bytes",
      LineNameOf(names, pool.id), LineText(pool.id.made), pool.requests, pool.frees, pool.peakBytes,
      left, pool.records, pool.bytes);
  if (pool.uncertainRecords > 0)
    text += fmt::format(", uncertain {} of {} bytes", pool.uncertainRecords, pool.uncertainBytes);
  for (const ClearSpan& span : pool.clears.items)
    text += fmt::format("\n    a Clear between line {} and line {}: its records of lines before {} "
                        "are uncertain",
                        span.after, span.before, span.before);
  return text;
}

std::string Sizes(const TraceLedger& ledger) {
  std::vector<std::pair<std::uint32_t, std::uint64_t>> sizes(ledger.requestsBySize.begin(),
                                                             ledger.requestsBySize.end());
  std::stable_sort(sizes.begin(), sizes.end(),
                   [](const auto& a, const auto& b) { return a.second > b.second; });
  return Section(
      "requests by size, most frequent first", sizes, sizes.size(),
      [](const auto& size) { return fmt::format("{:>10} bytes: {}", size.first, size.second); });
}

std::string Lifetimes(const TraceLedger& ledger) {
  std::string text = "\nlifetimes in trace lines, from a request to its Free\n";
  const std::uint64_t peak = *std::max_element(ledger.lifetimes.begin(), ledger.lifetimes.end());
  for (std::size_t i = 0; i < ledger.lifetimes.size(); ++i) {
    const std::uint64_t count = ledger.lifetimes[i];
    if (count == 0) continue;
    constexpr std::uint64_t width = 40;
    const auto stars = static_cast<std::size_t>(std::max<std::uint64_t>(count * width / peak, 1));
    text += fmt::format("  from {:>12}: {:>10} {}\n", std::uint64_t{1} << i, count,
                        std::string(stars, '*'));
  }
  return text;
}

} // namespace

std::string BareAddress(std::uint64_t addr) { return fmt::format("{:x}", addr); }

const std::string* PoolNames::Find(const PoolId& pool) const {
  if (const auto found = given.find(pool.addr); found != given.end()) return &found->second;
  const auto found = reported.find(pool);
  return found == reported.end() ? nullptr : &found->second;
}

std::string NameOf(const PoolNames& names, const PoolId& pool) {
  const std::string* const name = names.Find(pool);
  return name == nullptr ? BareAddress(pool.addr) : *name;
}

std::string SummariseTrace(const TraceLedger& ledger, std::uint64_t numLines,
                           const PoolNames& names) {
  const std::vector<const TracedPool*> pools = ledger.GetLivePools();
  const std::vector<TraceLedger::Live> live = ledger.GetLiveRecords();
  std::string text = fmt::format("{} lines, {} of them trace lines\n", numLines, ledger.numEvents);
  text += fmt::format("pools: {} constructed, {} destroyed, {} live at the end\n", ledger.numMade,
                      ledger.gone.count, pools.size());
  text +=
      fmt::format("peak of live bytes: {} at {}{}\n", ledger.peakBytes, LineText(ledger.peakLine),
                  ledger.numClears > 0 ? ", at most: a Clear has no line" : "");
  text += Section("live pools", pools, pools.size(),
                  [&](const TracedPool* pool) { return PoolText(*pool, names, "live"); });
  text +=
      Section("destroyed pools", ledger.gone.items, ledger.gone.count, [&](const TracedPool& pool) {
        return fmt::format("destruction {}: {}", LineText(pool.gone),
                           PoolText(pool, names, "left"));
      });
  const auto recordText = [&](const TraceLedger::Live& record) {
    return fmt::format("line {}: {} bytes at {} of {}{}", record.line, record.size,
                       BareAddress(record.data), LineNameOf(names, record.pool),
                       record.isUncertain ? ", uncertain: a Clear follows it" : "");
  };
  text += Section("live records at the end", live, live.size(), recordText);
  text +=
      Section("records left in destroyed pools", ledger.left.items, ledger.left.count,
              [&](const TraceLedger::Live& record) {
                return fmt::format("{}, destruction {}", recordText(record), LineText(record.gone));
              });
  text += Sizes(ledger) + Lifetimes(ledger);
  text +=
      Section("freed pointers that were not live in their pool", ledger.refused.items,
              ledger.refused.count, [&](const RefusedFree& free) {
                return fmt::format("line {}: {} to {}{}", free.line, BareAddress(free.data),
                                   LineNameOf(names, free.pool),
                                   free.owner ? ", live in " + LineNameOf(names, *free.owner) : "");
              });
  text += Section("skipped lines, which are mixed or cut", ledger.mixed.items, ledger.mixed.count,
                  [](const MixedLine& line) {
                    return fmt::format("line {}: {}", line.line, OneLine(line.text));
                  });
  return text;
}

namespace {

using Json = nlohmann::ordered_json;

std::string DumpOf(const Json& json) {
  return json.dump(-1, ' ', false, nlohmann::detail::error_handler_t::replace);
}

Json LineJson(LineNumber line) { return line == 0 ? Json() : Json(line); }

Json PoolJson(const TracedPool& pool, const PoolNames& names) {
  const std::string* const name = names.Find(pool.id);
  Json clears = Json::array();
  for (const ClearSpan& span : pool.clears.items)
    clears.push_back({{"after", span.after}, {"before", span.before}});
  return {{"pool", BareAddress(pool.id.addr)},
          {"name", name == nullptr ? Json() : Json(*name)},
          {"made", LineJson(pool.id.made)},
          {"gone", LineJson(pool.gone)},
          {"requests", pool.requests},
          {"frees", pool.frees},
          {"peakBytes", pool.peakBytes},
          {"records", pool.records},
          {"bytes", pool.bytes},
          {"uncertainRecords", pool.uncertainRecords},
          {"uncertainBytes", pool.uncertainBytes},
          {"numClears", pool.clears.count},
          {"clears", clears}};
}

/// Writes an array element by element.
template <class Items, class ToJson>
void WriteArray(const char* key, const Items& items, ToJson toJson,
                const std::function<void(std::string_view)>& write) {
  write(fmt::format(",\n\"{}\":[", key));
  std::string separator;
  for (const auto& item : items)
    write(std::exchange(separator, ",\n") + DumpOf(toJson(item)));
  write("]");
}

} // namespace

void WriteTraceJson(const TraceLedger& ledger, std::uint64_t numLines, const PoolNames& names,
                    const std::function<void(std::string_view)>& write) {
  std::string head = DumpOf({{"lines", numLines},
                             {"events", ledger.numEvents},
                             {"made", ledger.numMade},
                             {"gone", ledger.gone.count},
                             {"clears", ledger.numClears},
                             {"refused", ledger.refused.count},
                             {"numLeft", ledger.left.count},
                             {"mixed", ledger.mixed.count},
                             {"bytes", ledger.bytes},
                             {"peakBytes", ledger.peakBytes},
                             {"peakLine", LineJson(ledger.peakLine)}});
  head.pop_back(); // the arrays follow in the same object
  write(head);
  WriteArray(
      "standingPools", ledger.GetLivePools(),
      [&](const TracedPool* pool) { return PoolJson(*pool, names); }, write);
  WriteArray(
      "gonePools", ledger.gone.items, [&](const TracedPool& pool) { return PoolJson(pool, names); },
      write);
  const auto liveJson = [](const TraceLedger::Live& record) {
    return Json{{"line", record.line},
                {"pool", BareAddress(record.pool.addr)},
                {"data", BareAddress(record.data)},
                {"size", record.size},
                {"uncertain", record.isUncertain}};
  };
  WriteArray("live", ledger.GetLiveRecords(), liveJson, write);
  WriteArray(
      "left", ledger.left.items,
      [&](const TraceLedger::Live& record) {
        Json json = liveJson(record);
        json["gone"] = LineJson(record.gone);
        return json;
      },
      write);
  WriteArray(
      "sizes", ledger.requestsBySize,
      [](const auto& size) {
        return Json{{"size", size.first}, {"requests", size.second}};
      },
      write);
  std::vector<std::pair<std::uint64_t, std::uint64_t>> lifetimes;
  for (std::size_t i = 0; i < ledger.lifetimes.size(); ++i)
    if (ledger.lifetimes[i] > 0) lifetimes.emplace_back(std::uint64_t{1} << i, ledger.lifetimes[i]);
  WriteArray(
      "lifetimes", lifetimes,
      [](const auto& lifetime) {
        return Json{{"from", lifetime.first}, {"records", lifetime.second}};
      },
      write);
  WriteArray(
      "refusedFrees", ledger.refused.items,
      [](const RefusedFree& free) {
        return Json{{"line", free.line},
                    {"pool", BareAddress(free.pool.addr)},
                    {"data", BareAddress(free.data)},
                    {"liveIn", free.owner ? Json(BareAddress(free.owner->addr)) : Json()}};
      },
      write);
  WriteArray(
      "mixedLines", ledger.mixed.items,
      [](const MixedLine& line) {
        return Json{{"line", line.line}, {"text", line.text}};
      },
      write);
  write("}\n");
}

} // namespace VOK::MemPool::Tools
