// The memory-checking tools of a process: memcheck, the address sanitizer, heaptrack. One library
// serves all of them without a rebuild: it looks at load which are there, and reports to them each
// block and record. Trace shares a byte with them, all that the fast path of a request tests.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_OBSERVERS_H
#define VOK_MEMPOOL_OBSERVERS_H

#include "base/Attributes.h"

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool::Observers {

/// Why a request leaves the fast path, bit by bit: trace is on, a memory-checking tool is there.
/// The first bit is the trace switch itself: a copy of it could disagree when two threads set it at
/// once. The second one never changes after the load.
extern VOK_HIDDEN std::uint8_t watching;
inline constexpr std::uint8_t watchingTrace = 1;
inline constexpr std::uint8_t watchingTool = 2;

VOK_ALWAYS_INLINE bool Watching() { return watching != 0; }

/// Whether a memory-checking tool is there.
inline bool Present() { return (watching & watchingTool) != 0; }

/// The trace switch, which any thread may read and set at any time. A request that runs at the same
/// time reads the byte without synchronisation and takes either value.
bool IsTracing();
void SetTracing(bool on);

/// Whether a tool has replaced the heap: one of those above, or another one of valgrind.
bool ReplaceHeap();

/// Looks for the tools. Called once, while the library loads.
void Begin();

// Each of these reports to the tools that are there, and does nothing if there are none.

/// A block of the heap serves as bucket or ExtRec. To memcheck all of it is inaccessible, except
/// what leads its leak check on to the next block, the first two pointers.
void BlockMade(void* block, std::size_t size);

/// The block returns to the heap next and must bear no mark: its links are still read on the way.
void BlockGone(void* block, std::size_t size);

/// A free record: to the address sanitizer its data is poisoned.
void Vacant(const void* p, std::size_t capacity);

/// The caller holds `size` bytes of the record from now on, but not the rest of its capacity.
void RecordMade(const void* block, void* p, std::size_t size, std::size_t capacity);

/// The caller holds the record no longer.
void RecordGone(const void* block, void* p, std::size_t capacity);

/// While it lives, memcheck reports no error of this thread: for the library's own accesses to
/// headers, which are inaccessible. It lives for no call on the heap of a disabled pool.
class Quiet {
public:
  Quiet() : quiet(Present()) {
    if (quiet) [[unlikely]]
      SetReporting(false);
  }
  ~Quiet() {
    if (quiet) [[unlikely]]
      SetReporting(true);
  }
  Quiet(const Quiet&) = delete;
  Quiet& operator=(const Quiet&) = delete;

private:
  static void SetReporting(bool reports);

  const bool quiet;
};

} // namespace VOK::MemPool::Observers

#endif
