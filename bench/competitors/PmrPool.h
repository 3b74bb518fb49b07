// The standard library's pool for one thread, under its own limits.
#ifndef VOK_BENCH_COMPETITORS_PMRPOOL_H
#define VOK_BENCH_COMPETITORS_PMRPOOL_H

#include <cstddef>
#include <cstdint>
#include <memory_resource>

namespace Bench {

class PmrPool {
public:
  static constexpr std::size_t alignment = 8;

  void* Alloc(std::uint32_t size) { return pool.allocate(size, alignment); }
  void Free(void* p, std::uint32_t size) { pool.deallocate(p, size, alignment); }
  void Clear() { pool.release(); }

private:
  std::pmr::unsynchronized_pool_resource pool;
};

} // namespace Bench

#endif
