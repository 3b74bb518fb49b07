#include "trace/Massif.h"

#include <algorithm>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

void Massif::Add(const TraceLedger& ledger) {
  constexpr std::size_t most = 100;
  snapshots.push_back({ledger.numEvents, ledger.bytes});
  if (snapshots.size() >= most) {
    distance *= 2;
    std::erase_if(snapshots, [&](const Snapshot& s) { return s.event % distance != 0; });
  }
  next = (ledger.numEvents / distance + 1) * distance;
}

std::string Massif::GetText(const TraceLedger& ledger, const PoolNames& names,
                            std::string_view source) const {
  std::vector<Snapshot> all = snapshots;
  if (all.back().event != ledger.numEvents) all.push_back({ledger.numEvents, ledger.bytes});
  const auto isAtOrAfter = [&](const Snapshot& s) { return s.event >= ledger.peakEvent; };
  auto peak = std::find_if(all.begin(), all.end(), isAtOrAfter);
  if (peak->event != ledger.peakEvent)
    peak = all.insert(peak, {ledger.peakEvent, ledger.peakBytes});

  std::string text = fmt::format("desc: live bytes of pools, from their trace lines\n"
                                 "cmd: {}\ntime_unit: i\n",
                                 OneLine(source));
  for (auto snapshot = all.begin(); snapshot != all.end(); ++snapshot) {
    text += fmt::format("#-----------\nsnapshot={}\n#-----------\ntime={}\nmem_heap_B={}\n"
                        "mem_heap_extra_B=0\nmem_stacks_B=0\n",
                        snapshot - all.begin(), snapshot->event, snapshot->bytes);
    if (snapshot != peak || ledger.peakBytes == 0) {
      text += "heap_tree=empty\n";
      continue;
    }
    const auto pools = ledger.GetPoolsAtPeak();
    text += fmt::format("heap_tree=peak\nn{}: {} (requests of pools, line {})\n", pools.size(),
                        snapshot->bytes, ledger.peakLine);
    for (const auto& [addr, bytes] : pools)
      text += fmt::format(" n0: {} pool {}\n", bytes, OneLine(NameOf(names, addr)));
  }
  return text;
}

} // namespace VOK::MemPool::Tools
