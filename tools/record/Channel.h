// The writing end of a process's ring.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_CHANNEL_H
#define VOK_MEMPOOL_TOOLS_RECORD_CHANNEL_H

#include "record/Ring.h"

#include <cstdint>

namespace VOK::MemPool::Record {

/// An event as it is put into the ring; what `size` means depends on the kind.
struct Event {
  Kind kind;
  std::uint8_t alignmentLog = 0;
  std::uint32_t stack = 0;
  std::uint64_t address = 0;
  std::uint64_t size = 0;
};

namespace Channel {

/// Reads the environment. Without the recorder's variables nothing is ever recorded.
void Prepare();

/// The depth of call stacks.
unsigned GetDepth();

/// Whether the process has a ring; makes it, if it is the first event of the process.
bool IsOpen();

/// Puts an event, with `event.size` elements from `tail` if it has some. Waits while the ring is
/// full.
void Put(const Event& event);
void Put(const Event& event, const void* tail, std::size_t bytes);

/// In the child of a fork: forgets the parent's ring. The next event makes one.
void Forget();

} // namespace Channel

} // namespace VOK::MemPool::Record

#endif
