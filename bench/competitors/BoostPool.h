// One boost::pool for each multiple of 8 up to 1,000 bytes, about the span that the library serves
// from buckets; the heap above.
#ifndef VOK_BENCH_COMPETITORS_BOOSTPOOL_H
#define VOK_BENCH_COMPETITORS_BOOSTPOOL_H

#include "competitors/Heap.h"

#include <boost/pool/pool.hpp>

#include <array>
#include <cstddef>
#include <cstdint>
#include <new>
#include <optional>

namespace Bench {

class BoostPool {
public:
  static constexpr std::size_t alignment = 8;

  void* Alloc(std::uint32_t size) {
    if (size > largest) return heap.Alloc(size);
    std::optional<boost::pool<>>& pool = pools[IndexOf(size)];
    if (!pool) pool.emplace((IndexOf(size) + 1) * alignment);
    void* const p = pool->malloc();
    if (p == nullptr) throw std::bad_alloc();
    return p;
  }

  void Free(void* p, std::uint32_t size) {
    if (size > largest) return heap.Free(p, size);
    pools[IndexOf(size)]->free(p);
  }

  /// REQUIRES: no block above `largest` is in use, as the heap has no such call.
  void Clear() {
    for (std::optional<boost::pool<>>& pool : pools)
      if (pool) pool->purge_memory();
  }

private:
  static constexpr std::uint32_t largest = 1000;

  // A size of 0 shares the smallest class.
  static std::size_t IndexOf(std::uint32_t size) { return size == 0 ? 0 : (size - 1) / alignment; }

  std::array<std::optional<boost::pool<>>, largest / alignment> pools;
  Heap heap;
};

} // namespace Bench

#endif
