// This library, one pool under the settings of the environment.
#ifndef VOK_BENCH_COMPETITORS_VOKPOOL_H
#define VOK_BENCH_COMPETITORS_VOKPOOL_H

#include <MemPool>

#include <cassert>
#include <cstddef>
#include <cstdint>
#include <stdexcept>

namespace Bench {

class VokPool {
public:
  static constexpr std::size_t alignment = 4;

  VokPool() {
    if (!mgr.IsEnabled()) throw std::runtime_error("pooling is off: set ZOR_VOK_MEMPOOL_ON=1");
  }

  void* Alloc(std::uint32_t size) { return mgr.Alloc(size); }
  void Free(void* p, std::uint32_t) { mgr.Free(p); }
  void Clear() { mgr.Clear(); }
  void Reset() { mgr.Reset(); }

  /// A block aligned to 8, under the default settings. With 8-byte pointers a bucket's first data
  /// lies 52 bytes into its heap block. Where the stride is a multiple of 8, all data of the bucket
  /// is 4 off a multiple of 8. So a request of 4 bytes more whose first 4 bytes are skipped is
  /// aligned; it costs 4 bytes per record, 8 with the record's header. A block above the largest
  /// record has its data 24 bytes into a heap block, which is aligned already. REQUIRES: `size` is
  /// a multiple of 8.
  void* AllocAligned8(std::uint32_t size) {
    assert(size % 8 == 0);
    void* p = mgr.Alloc(size > largest ? size : size + shift);
    if (size <= largest) p = static_cast<char*>(p) + shift;
    assert(reinterpret_cast<std::uintptr_t>(p) % 8 == 0);
    return p;
  }

  void FreeAligned8(void* p, std::uint32_t size) {
    mgr.Free(size > largest ? p : static_cast<char*>(p) - shift);
  }

private:
  static_assert(sizeof(void*) == 8, "a bucket's header is shorter at 4-byte pointers");
  static constexpr std::uint32_t shift = 4;
  static constexpr std::uint32_t largest = 996 - shift;

  VOK::MemPool::Mgr mgr;
};

} // namespace Bench

#endif
