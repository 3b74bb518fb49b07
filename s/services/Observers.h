// The checkers that may watch a process: memcheck, the address sanitizer, heaptrack. One library
// serves all of them without a rebuild: it looks at load which are there, and tells them of each
// block and record. Trace shares their byte, the one thing that the road of a request tests.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_OBSERVERS_H
#define VOK_MEMPOOL_OBSERVERS_H

#include "engine/HotCold.h"

#include <cstddef>

namespace VOK::MemPool::Observers {

/// A checker is there.
extern VOK_HIDDEN bool present;

/// Derived: a checker is there, or the trace switch is on.
extern VOK_HIDDEN bool watching;

inline bool Present() { return present; }
VOK_HOT bool Watching() { return watching; }

/// Looks for the checkers. Called once, while the library loads, behind the settings.
void Begin();

/// Derives `watching` anew. REQUIRED behind each change of the trace switch.
void Update();

// Each of these tells the checkers that are there, and does nothing if there are none.

/// A block of the heap serves as bucket or ExtRec: nothing in it is the caller's yet, except what
/// leads a leak checker on to the next block, its first two pointers.
void BlockMade(void* block, std::size_t size);

/// The block goes back to the heap and must bear no mark.
void BlockGone(void* block, std::size_t size);

/// A record that nobody holds: its data must not be touched.
void Vacant(const void* p, std::size_t capacity);

/// The caller holds `size` bytes of the record from now on, but not the rest of its capacity.
void RecordMade(const void* block, void* p, std::size_t size, std::size_t capacity);

/// The caller holds the record no longer.
void RecordGone(const void* block, void* p, std::size_t capacity);

/// While it lives, memcheck judges nothing that this thread does: for the library's own accesses to
/// headers, which are marked as nobody's. It lives for no call on the heap of a disabled pool.
class Quiet {
public:
  explicit Quiet(bool wanted = true) : quiet(wanted && present) {
    if (quiet) [[unlikely]]
      Judge(false);
  }
  ~Quiet() {
    if (quiet) [[unlikely]]
      Judge(true);
  }
  Quiet(const Quiet&) = delete;
  Quiet& operator=(const Quiet&) = delete;

private:
  static void Judge(bool judging);

  const bool quiet;
};

} // namespace VOK::MemPool::Observers

#endif
