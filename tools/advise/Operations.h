// The operations of a recording as a program of their own replays them: one file in memory, which
// advise writes and the replaying process maps.
//
//   offset
//        0  OperationsHeader
//       64  `count` operations of 12 bytes
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_OPERATIONS_H
#define VOK_MEMPOOL_TOOLS_ADVISE_OPERATIONS_H

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool::Tools {

enum class Action : std::uint8_t {
  Alloc,
  AllocZero, ///< calloc
  Free,
  FreeWithAll, ///< one of those that Reset replaces
  Resize,
  Reset, ///< no block of the group is live: where it is reset, here
};

/// A group of sites has a pool; the first group has none.
struct Operation {
  std::uint32_t slot; ///< of the block: slots are used again
  std::uint32_t size;
  Action action;
  std::uint8_t group;
  std::uint8_t alignmentLog;
  std::uint8_t reserved;
};
static_assert(sizeof(Operation) == 12 && offsetof(Operation, action) == 8);

struct OperationsHeader {
  std::uint64_t count;
  std::uint64_t first;   ///< the operations before it make what is live at the start; not timed
  std::uint64_t peak;    ///< the operation after which most bytes are live
  std::uint64_t aligned; ///< bit for each group whose data an adaptor aligns to 8
  std::uint32_t slots;
  std::uint32_t groups; ///< with the first one
  std::uint32_t reserved[6];
};
static_assert(sizeof(OperationsHeader) == 64);

constexpr unsigned mostGroups = 64; // as bits of a number

constexpr int badSettings = 2; // status of a replay whose settings no pool can have

} // namespace VOK::MemPool::Tools

#endif
