// Which call sites could move to pools.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_PLAN_H
#define VOK_MEMPOOL_TOOLS_ADVISE_PLAN_H

#include "advise/Statistics.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// Whether a site could have a pool, and why it couldn't.
struct Verdict {
  bool isCandidate;
  std::string reason; ///< of a candidate: what speaks for it
};

Verdict Judge(const Site& site, const Statistics& statistics);

/// The candidates with the most requests, `most` at most, by site number.
std::vector<std::uint32_t> FindCandidates(const Statistics& statistics, std::size_t most);

} // namespace VOK::MemPool::Tools

#endif
