// The pools in the memory of another process, as reports. Nothing that is read is believed: each
// address, count and link has bounds.
// Test: tests/tools/inspect_test.py.
#ifndef VOK_MEMPOOL_TOOLS_INSPECT_POOLS_H
#define VOK_MEMPOOL_TOOLS_INSPECT_POOLS_H

#include "inspect/Memory.h"
#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct Pool {
  Report report;
  std::vector<std::string> damages; ///< what keeps a part of the pool from being read
  bool isMoving = false;            ///< no two passes read the same

  bool IsDamaged() const { return !isMoving && !damages.empty(); }
};

struct Pools {
  std::vector<Pool> all;
  std::vector<std::string> damages; ///< what keeps a part of the registry from being read
};

struct Library;

/// A pool's name, and where the pool is.
struct PoolPlace {
  std::string name;
  std::uint64_t pool;
  bool operator==(const PoolPlace&) const = default;
};

/// The pools of a library by ascending name, from one pass. Fails if the registry can't be read.
std::vector<PoolPlace> ListPools(const Library& library);

/// The pools of each library in the process, by ascending name. The lines of their reports are
/// numbered as one text. `detailed` adds the report of each bucket. A Failure says that there is no
/// library.
Pools ReadPools(const Memory& memory, bool detailed);

} // namespace VOK::MemPool::Tools

#endif
