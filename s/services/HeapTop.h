// What the library asks of glibc's heap. Emptied buckets lie at the heap's top, where glibc
// returns them to the system one by one: a system call and a page to zero again for each. On
// another heap, and beside a memory-checking tool, nothing here does anything. Test:
// tests/process_test.py.
#ifndef VOK_MEMPOOL_HEAPTOP_H
#define VOK_MEMPOOL_HEAPTOP_H

#include <cstddef>

namespace VOK::MemPool::HeapTop {

/// Lets the heap keep more free bytes at its top, 62 MiB with 8-byte pointers and 896 KiB with
/// 4-byte ones, unless the program has set its threshold. Counts once in the process.
void KeepSlack();

/// While it lives, a block lies above what is released, so that the heap returns all of it to the
/// system in one call. Does nothing where no memory is left, and for a few bytes.
class Plug {
public:
  explicit Plug(std::size_t bytesReleased);
  ~Plug();
  Plug(const Plug&) = delete;
  Plug& operator=(const Plug&) = delete;

private:
  void* const block;
};

} // namespace VOK::MemPool::HeapTop

#endif
