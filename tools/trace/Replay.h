// The pools of a trace made anew: the same operations on the real library, whose own report then
// shows them as they stood at a line.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_REPLAY_H
#define VOK_MEMPOOL_TOOLS_TRACE_REPLAY_H

#include "trace/Summary.h"

#include <MemPool>
#include <cstdint>
#include <memory>
#include <unordered_map>

namespace VOK::MemPool::Tools {

/// The pools are built under the library's settings of that moment, and end with the object.
class Replay {
public:
  explicit Replay(PoolNames names);

  /// Does what the line tells, as far as the ledger finds that it was done: a refused Free isn't,
  /// and a Clear that the line proves comes in front of it. Fails for a second pool of a name.
  void Take(const TraceEvent& event, const TraceLedger::Verdict& verdict);

  /// Writes the library's reports of all pools that stand.
  void Print(bool detailed) const;

private:
  Mgr& PoolOf(std::uint64_t addr);
  void Make(std::uint64_t addr);

  const PoolNames names;
  std::unordered_map<std::uint64_t, std::unique_ptr<Mgr>> pools; ///< by address in the trace
  std::unordered_map<std::uint64_t, void*> blocks;               ///< likewise
};

} // namespace VOK::MemPool::Tools

#endif
