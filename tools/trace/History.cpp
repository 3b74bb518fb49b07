#include "trace/History.h"

#include "common/Files.h"

#include <algorithm>
#include <fmt/format.h>
#include <map>
#include <utility>

namespace VOK::MemPool::Tools {

History::Snapshot History::SnapshotOf(LineNumber line, const TraceLedger& ledger) {
  Snapshot made{ledger.numEvents, line, ledger.bytes};
  for (const TracedPool* pool : ledger.GetLivePools())
    made.pools.push_back({pool->id, pool->bytes});
  return made;
}

void History::Add(LineNumber line, const TraceLedger& ledger) {
  constexpr std::size_t most = 100;
  snapshots.push_back(SnapshotOf(line, ledger));
  if (snapshots.size() >= most) {
    distance *= 2;
    std::erase_if(snapshots, [&](const Snapshot& s) { return s.event % distance != 0; });
  }
  next = (ledger.numEvents / distance + 1) * distance;
}

std::vector<History::Snapshot> History::GetSnapshots(LineNumber lastLine,
                                                     const TraceLedger& ledger) const {
  std::vector<Snapshot> all = snapshots;
  if (all.back().event != ledger.numEvents) all.push_back(SnapshotOf(lastLine, ledger));
  return all;
}

namespace {

struct MassifPoint {
  std::uint64_t event, bytes;
  std::string tree = "heap_tree=empty\n";
};

std::string MassifOf(std::string_view what, std::string_view source,
                     const std::vector<MassifPoint>& points) {
  std::string text = fmt::format("desc: live bytes of {}, from their trace lines\n"
                                 "cmd: {}\ntime_unit: i\n",
                                 what, OneLine(source));
  for (const MassifPoint& point : points)
    text += fmt::format("#-----------\nsnapshot={}\n#-----------\ntime={}\nmem_heap_B={}\n"
                        "mem_heap_extra_B=0\nmem_stacks_B=0\n{}",
                        &point - points.data(), point.event, point.bytes, point.tree);
  return text;
}

std::string TreeAtPeak(const TraceLedger& ledger, const PoolNames& names) {
  const auto pools = ledger.GetPoolsAtPeak();
  std::string tree = fmt::format("heap_tree=peak\nn{}: {} (requests of pools, line {})\n",
                                 pools.size(), ledger.peakBytes, ledger.peakLine);
  for (const auto& [pool, bytes] : pools)
    tree += fmt::format(" n0: {} pool {}\n", bytes, OneLine(NameOf(names, pool)));
  return tree;
}

} // namespace

std::string MassifText(const std::vector<History::Snapshot>& snapshots, const TraceLedger& ledger,
                       const PoolNames& names, std::string_view source) {
  std::vector<MassifPoint> points;
  points.reserve(snapshots.size());
  for (const History::Snapshot& snapshot : snapshots)
    points.push_back({snapshot.event, snapshot.bytes});
  const auto isAtOrAfter = [&](const MassifPoint& p) { return p.event >= ledger.peakEvent; };
  auto peak = std::find_if(points.begin(), points.end(), isAtOrAfter);
  if (peak->event != ledger.peakEvent)
    peak = points.insert(peak, {ledger.peakEvent, ledger.peakBytes});
  if (ledger.peakBytes != 0) peak->tree = TreeAtPeak(ledger, names);
  return MassifOf("pools", source, points);
}

std::vector<std::string> MassifTextsOfPools(const std::vector<History::Snapshot>& snapshots,
                                            const PoolNames& names, std::string_view source) {
  std::map<PoolId, std::vector<MassifPoint>> pools;
  for (const History::Snapshot& snapshot : snapshots)
    for (const History::PoolBytes& one : snapshot.pools)
      pools[one.pool].push_back({snapshot.event, one.bytes});
  std::vector<std::string> texts;
  for (auto& [pool, points] : pools) {
    const auto peak = std::ranges::max_element(points, {}, &MassifPoint::bytes);
    const std::string what = "pool " + OneLine(NameOf(names, pool));
    peak->tree = fmt::format("heap_tree=peak\nn0: {} {}\n", peak->bytes, what);
    texts.push_back(MassifOf(what, source, points));
  }
  return texts;
}

} // namespace VOK::MemPool::Tools
