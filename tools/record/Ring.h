// The memory that a recorded process shares with the recorder: one file per process, into which the
// preloaded library puts events and from which the recorder takes them.
//
//   offset
//        0  RingHeader: what the process is, and the two positions
//      256  slots[ringSlots] of 32 bytes; position p lies in slot p % ringSlots
//
// A thread reserves the positions of an event by one addition to `reserved`, so the order of
// positions is the order of events in the process: a block's event follows its allocation and
// precedes its release. It fills the slots and publishes each by its `turn`.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_RING_H
#define VOK_MEMPOOL_TOOLS_RECORD_RING_H

#include <atomic>
#include <cstddef>
#include <cstdint>

namespace VOK::MemPool::Record {

enum class Kind : std::uint8_t {
  Malloc, ///< blocks: `address`, `size`, `alignment` (0: the allocator's), `stack`
  Calloc,
  Aligned,
  Realloc, ///< a block that ReallocBegin announced: `address`, `size`, `stack`; it may have moved
  ReallocBegin, ///< `address` is about to be reallocated by this thread
  ReallocEnd,   ///< no block came of it: of `size` 0 it was freed, else it is as it was
  Free,         ///< `address`
  Stack,        ///< `stack` is new; `size` return addresses follow, the innermost first
  Module,       ///< mapped at `address`; its path of `size` bytes follows
  Unload,       ///< modules may be gone: those that follow are all
  Command,      ///< the arguments, each with its 0; `size` bytes follow
  Executable,   ///< the path of the program; `size` bytes follow
};

/// 32 bytes, a half of a cache line.
struct Slot {
  std::atomic<std::uint32_t> turn; ///<  0: position / ringSlots + 1 once the slot is published
  std::uint32_t stack;             ///<  4: number of the call stack
  std::uint64_t time;              ///<  8: nanoseconds of CLOCK_MONOTONIC_COARSE
  std::uint64_t address;           ///< 16: low 56 bits; the kind above them
  std::uint64_t size;              ///< 24: low 42 bits; 6 of log2(alignment), 16 of the thread
};
static_assert(sizeof(Slot) == 32 && offsetof(Slot, stack) == 4 && offsetof(Slot, time) == 8 &&
              offsetof(Slot, address) == 16 && offsetof(Slot, size) == 24);

/// Bytes that a slot carries after the first one of an event with more to say.
constexpr std::size_t bytesPerSlot = sizeof(Slot) - offsetof(Slot, time);

/// `stack` of those slots, so that none is taken for an event.
constexpr std::uint32_t tailMark = 0xffffffff;

constexpr unsigned kindShift = 56, alignmentShift = 42, threadShift = 48;
constexpr std::uint64_t addressMask = (std::uint64_t(1) << kindShift) - 1;
constexpr std::uint64_t sizeMask = (std::uint64_t(1) << alignmentShift) - 1;

constexpr std::uint64_t ringSlots = 1 << 18;

/// The positions lie in cache lines of their own: all threads write the first, the recorder writes
/// the second.
// NOLINTNEXTLINE(clang-analyzer-optin.performance.Padding): lines of their own are padded
struct RingHeader {
  std::int32_t process;                               ///<   0
  std::int32_t parent;                                ///<   4
  std::uint64_t startTime;                            ///<   8: as the times of the slots
  alignas(64) std::atomic<std::uint64_t> reserved;    ///<  64: the next free position
  alignas(64) std::atomic<std::uint64_t> taken;       ///< 128: positions before it are free again
  alignas(64) std::atomic<std::uint32_t> isAbandoned; ///< 192: the recorder takes no more
};
static_assert(sizeof(RingHeader) == 256 && offsetof(RingHeader, reserved) == 64 &&
              offsetof(RingHeader, taken) == 128 && offsetof(RingHeader, isAbandoned) == 192);

/// How a ring's file ends once its header is valid: "PROCESS.TIME.ring".
constexpr const char* ringSuffix = ".ring";

struct Ring {
  RingHeader header;
  Slot slots[ringSlots];
};

/// Names of the environment variables by which the recorder speaks to the library, and their start.
constexpr const char* variables = "VOK_MEMPOOL_RECORD_";
constexpr const char* folderVariable = "VOK_MEMPOOL_RECORD_FOLDER";   ///< where the rings are made
constexpr const char* settingVariable = "VOK_MEMPOOL_RECORD_SETTING"; ///< "DEPTH PID", decimal: how
                                                                      ///< deep; the recorder's

constexpr unsigned maxDepth = 64;

} // namespace VOK::MemPool::Record

#endif
