// The pools of a trace rebuilt: the same operations on the real library, whose own report then
// shows them as of a line. Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_REPLAY_H
#define VOK_MEMPOOL_TOOLS_TRACE_REPLAY_H

#include "trace/Summary.h"

#include <MemPool>
#include <cstdint>
#include <memory>
#include <unordered_map>

namespace VOK::MemPool::Tools {

/// The pools are constructed under the library's current settings, and destroyed with the object.
class Replay {
public:
  explicit Replay(PoolNames names);

  /// Repeats the operation of a line if the ledger finds that it was done, which a refused Free was
  /// not. A Clear that the line proves comes first. Fails for a second pool of a name.
  void Take(const TraceEvent& event, const TraceLedger::Verdict& verdict);

  /// Writes the library's reports of all live pools.
  void Print(bool detailed) const;

private:
  Mgr& PoolOf(std::uint64_t addr);
  void Construct(std::uint64_t addr);

  const PoolNames names;
  std::unordered_map<std::uint64_t, std::unique_ptr<Mgr>> pools; ///< by address in the trace
  std::unordered_map<std::uint64_t, void*> blocks;               ///< likewise
};

} // namespace VOK::MemPool::Tools

#endif
