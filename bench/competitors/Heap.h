// The general heap: glibc's, or the one that LD_PRELOAD puts in its place.
#ifndef VOK_BENCH_COMPETITORS_HEAP_H
#define VOK_BENCH_COMPETITORS_HEAP_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <new>

namespace Bench {

class Heap {
public:
  static constexpr std::size_t alignment = alignof(std::max_align_t);
  static constexpr bool isThreadSafe = true;

  void* Alloc(std::uint32_t size) {
    void* const p = std::malloc(size);
    if (p == nullptr && size != 0) throw std::bad_alloc();
    return p;
  }

  void Free(void* p, std::uint32_t) { std::free(p); }
};

} // namespace Bench

#endif
