// Hostile text for the reader of traces, its ledger and the replay on the real library: the sums of
// the ledger hold, and no operation of the replay is one that a pool doesn't allow.
#include "Failure.h"
#include "Massif.h"
#include "Replay.h"
#include "Target.h"
#include "TraceSummary.h"

#include <sstream>
#include <string>

using namespace VOK::MemPool;
using namespace VOK::MemPool::Tools;

namespace {

void CheckSums(const TraceLedger& ledger) {
  std::uint64_t records = ledger.GetLive().size();
  std::uint64_t bytes = ledger.bytes;
  std::uint64_t atPeak = ledger.peakBytes;
  for (const TracedPool* pool : ledger.GetStanding()) {
    records -= pool->records + pool->uncertainRecords;
    bytes -= pool->bytes;
  }
  for (const auto& [addr, held] : ledger.GetPoolsAtPeak())
    atPeak -= held;
  Demand(records == 0 && bytes == 0 && atPeak == 0);
}

void ReadLines(const std::string& input) {
  constexpr std::uint32_t largest = 100000; // a replay of more would be a test of the heap
  TraceLedger ledger;
  Massif massif;
  Replay replay({});
  std::istringstream in(input);
  std::uint64_t number = 0;
  for (std::string line; std::getline(in, line);) {
    TraceEvent event;
    const LineKind kind = ReadTraceLine(line, event);
    ++number;
    if (kind == LineKind::Mixed) ledger.TakeMixed(number, line);
    if (kind != LineKind::Event || event.size > largest) continue;
    replay.Take(event, ledger.Take(number, event));
    massif.Sample(ledger);
  }
  CheckSums(ledger);
  Demand(!SummariseTrace(ledger, number, {}).empty());
  Demand(!massif.GetText(ledger, {}, "").empty());
  WriteTraceJson(ledger, number, {}, [](std::string_view) {});
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  ZOR_VOK_MEMPOOL_ON(true);
  ReadLines(std::string(reinterpret_cast<const char*>(data), size));
  return 0;
}
