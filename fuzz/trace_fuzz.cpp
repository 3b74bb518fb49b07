// Hostile text for the reader of traces, its ledger and the replay on the real library: the replay
// makes no call that a pool does not allow.
#include "Target.h"
#include "chart/Series.h"
#include "trace/History.h"
#include "trace/Replay.h"
#include "trace/Summary.h"

#include <sstream>
#include <string>

using namespace VOK::MemPool;
using namespace VOK::MemPool::Tools;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::uint32_t largest = 100000; // a replay of more would be a test of the heap
  TraceLedger ledger;
  History history;
  ZOR_VOK_MEMPOOL_ON(true);
  Replay replay({});
  std::istringstream in(std::string(reinterpret_cast<const char*>(data), size));
  std::uint64_t number = 0;
  for (std::string line; std::getline(in, line);) {
    TraceEvent event;
    const LineKind kind = ReadTraceLine(line, event);
    ++number;
    if (kind == LineKind::Mixed) ledger.TakeMixed(number, line);
    if (kind != LineKind::Event || event.size > largest) continue;
    replay.Take(event, ledger.Take(number, event));
    history.Sample(number, ledger);
  }
  SummariseTrace(ledger, number, {});
  const auto snapshots = history.GetSnapshots(number, ledger);
  MassifText(snapshots, ledger, {}, "");
  MassifTextsOfPools(snapshots, {}, "");
  SeriesOf(snapshots, {});
  WriteTraceJson(ledger, number, {}, [](std::string_view) {});
  return 0;
}
