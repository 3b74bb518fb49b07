// The standard library's pools, for one thread or for all, under their own limits.
#ifndef VOK_BENCH_COMPETITORS_PMRPOOL_H
#define VOK_BENCH_COMPETITORS_PMRPOOL_H

#include <cstddef>
#include <cstdint>
#include <memory_resource>
#include <type_traits>

namespace Bench {

template <class Resource>
class PmrPool {
public:
  static constexpr std::size_t alignment = 8;
  static constexpr bool isThreadSafe =
      std::is_same_v<Resource, std::pmr::synchronized_pool_resource>;

  void* Alloc(std::uint32_t size) { return pool.allocate(size, alignment); }
  void Free(void* p, std::uint32_t size) { pool.deallocate(p, size, alignment); }
  void Clear() { pool.release(); }

private:
  Resource pool;
};

} // namespace Bench

#endif
