// What the library asks of glibc's heap. Emptied buckets lie at the heap's top, where glibc returns
// them to the system one by one: a system call for each, and a page to zero again. On another heap,
// and where a tool has replaced it, nothing here does anything.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_HEAPTOP_H
#define VOK_MEMPOOL_HEAPTOP_H

#include <cstdint>

namespace VOK::MemPool::HeapTop {

/// Lets the heap keep more free bytes at its top, 62 MiB with 8-byte pointers and 896 KiB with
/// 4-byte ones, unless the program has set its threshold. Only the first call has an effect.
void KeepSlack();

/// Asks for a block above the buckets that are released while it lives, so that the heap returns
/// all of them to the system in one call. Does nothing below 128 KiB of buckets, before the first
/// KeepSlack, and where no memory is left.
class Plug {
public:
  explicit Plug(std::uint64_t bytesReleased);
  ~Plug();
  Plug(const Plug&) = delete;
  Plug& operator=(const Plug&) = delete;

private:
  void* const block;
};

} // namespace VOK::MemPool::HeapTop

#endif
