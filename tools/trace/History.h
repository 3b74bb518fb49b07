// Live bytes over the course of a trace.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_HISTORY_H
#define VOK_MEMPOOL_TOOLS_TRACE_HISTORY_H

#include "trace/Summary.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// Samples at even distances, at most a hundred: at the limit every second one is dropped and the
/// distance doubles.
class History {
public:
  struct PoolBytes {
    PoolId pool;
    std::uint64_t bytes;
  };

  struct Snapshot {
    std::uint64_t event = 0; ///< counted in trace lines
    LineNumber line = 0;
    std::uint64_t bytes = 0;
    std::vector<PoolBytes> pools = {}; ///< those that are live
  };

  /// To be called after each trace line.
  void Sample(LineNumber line, const TraceLedger& ledger) {
    if (ledger.numEvents >= next) Add(line, ledger);
  }

  /// Before the first line, at the samples, and after the last line.
  std::vector<Snapshot> GetSnapshots(LineNumber lastLine, const TraceLedger& ledger) const;

private:
  static Snapshot SnapshotOf(LineNumber line, const TraceLedger& ledger);
  void Add(LineNumber line, const TraceLedger& ledger);

  std::vector<Snapshot> snapshots{{}};
  std::uint64_t distance = 1, next = 1;
};

// Texts that ms_print draws. Time is counted in trace lines. `source` is what was read.

/// The snapshots, and the peak with what each pool holds there.
std::string MassifText(const std::vector<History::Snapshot>& snapshots, const TraceLedger& ledger,
                       const PoolNames& names, std::string_view source);

/// A text for each pool of the snapshots, by the line of its construction; the peak is the largest
/// snapshot.
std::vector<std::string> MassifTextsOfPools(const std::vector<History::Snapshot>& snapshots,
                                            const PoolNames& names, std::string_view source);

} // namespace VOK::MemPool::Tools

#endif
