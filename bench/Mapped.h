// Memory for the harness itself. It doesn't come from the heap under test: blocks that the harness
// has freed would serve an allocator whose growth is measured.
#ifndef VOK_BENCH_MAPPED_H
#define VOK_BENCH_MAPPED_H

#include <sys/mman.h>

#include <cstddef>
#include <new>
#include <vector>

namespace Bench {

template <class T>
struct MappedAllocator {
  using value_type = T;

  MappedAllocator() = default;
  template <class U>
  explicit MappedAllocator(const MappedAllocator<U>&) {}

  T* allocate(std::size_t n) {
    void* const p =
        mmap(nullptr, n * sizeof(T), PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (p == MAP_FAILED) throw std::bad_alloc();
    return static_cast<T*>(p);
  }
  void deallocate(T* p, std::size_t n) { munmap(p, n * sizeof(T)); }

  friend bool operator==(const MappedAllocator&, const MappedAllocator&) { return true; }
};

template <class T>
using MappedVector = std::vector<T, MappedAllocator<T>>;

} // namespace Bench

#endif
