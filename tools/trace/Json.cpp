#include "trace/Summary.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>
#include <utility>

namespace VOK::MemPool::Tools {

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
