// This library's standard allocators: over one pool, or over pools by thread.
#ifndef VOK_BENCH_COMPETITORS_VOKALLOCATOR_H
#define VOK_BENCH_COMPETITORS_VOKALLOCATOR_H

#include <MemPoolThreads>

#include <cstddef>
#include <cstdint>
#include <type_traits>

namespace Bench {

template <class Pools, class Allocator>
class VokAllocator {
public:
  static constexpr std::size_t alignment = 8;
  static constexpr bool isThreadSafe = std::is_same_v<Pools, VOK::MemPool::ThreadPools>;

  void* Alloc(std::uint32_t size) { return allocator.allocate(NumWords(size)); }
  void Free(void* p, std::uint32_t size) {
    allocator.deallocate(static_cast<std::uint64_t*>(p), NumWords(size));
  }

private:
  static std::size_t NumWords(std::uint32_t size) { return (size + std::size_t{7}) / 8; }

  Pools pools{"bench", VOK::MemPool::Options().On()};
  Allocator allocator{pools};
};

} // namespace Bench

#endif
