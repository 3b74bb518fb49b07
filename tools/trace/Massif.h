// Live bytes over the course of a trace, in the form that ms_print draws.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_MASSIF_H
#define VOK_MEMPOOL_TOOLS_TRACE_MASSIF_H

#include "trace/Summary.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// Samples at even distances, at most a hundred: at the limit every second one is dropped and the
/// distance doubles.
class Massif {
public:
  /// To be called after each trace line.
  void Sample(const TraceLedger& ledger) {
    if (ledger.numEvents >= next) Add(ledger);
  }

  /// The file: the samples, the peak with what each pool holds there, and the end. Time is counted
  /// in trace lines. `source` is what was read.
  std::string GetText(const TraceLedger& ledger, const PoolNames& names,
                      std::string_view source) const;

private:
  struct Snapshot {
    std::uint64_t event, bytes;
  };

  void Add(const TraceLedger& ledger);

  std::vector<Snapshot> snapshots{{0, 0}};
  std::uint64_t distance = 1, next = 1;
};

} // namespace VOK::MemPool::Tools

#endif
