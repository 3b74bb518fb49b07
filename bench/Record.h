// What a workload does with a record besides its allocation: it writes data at both ends when it
// allocates the record and reads them when it frees it. The sums of the data read must agree
// between all allocators.
#ifndef VOK_BENCH_RECORD_H
#define VOK_BENCH_RECORD_H

#include <cstdint>
#include <cstring>

namespace Bench {

struct Block {
  void* p = nullptr;
  std::uint32_t size = 0;
};

/// Writes `value` at both ends of a record; a record below 4 bytes is left alone.
inline void Write(void* p, std::uint32_t size, std::uint32_t value) {
  if (size < sizeof value) return;
  std::memcpy(p, &value, sizeof value);
  std::memcpy(static_cast<char*>(p) + size - sizeof value, &value, sizeof value);
}

/// The sum of both ends.
inline std::uint32_t Read(const void* p, std::uint32_t size) {
  std::uint32_t first = 0;
  std::uint32_t last = 0;
  if (size < sizeof first) return 0;
  std::memcpy(&first, p, sizeof first);
  std::memcpy(&last, static_cast<const char*>(p) + size - sizeof last, sizeof last);
  return first + last;
}

template <class Allocator>
Block AllocRecord(Allocator& allocator, std::uint32_t size, std::uint32_t value) {
  void* const p = allocator.Alloc(size);
  Write(p, size, value);
  return {p, size};
}

/// Frees the block and returns the sum of its data.
template <class Allocator>
std::uint32_t FreeRecord(Allocator& allocator, const Block& block) {
  const std::uint32_t sum = Read(block.p, block.size);
  allocator.Free(block.p, block.size);
  return sum;
}

/// Some hundred million random numbers a second (splitmix64), the same ones in every process.
class Random {
public:
  explicit Random(std::uint64_t seed) : state(seed) {}

  std::uint64_t operator()() {
    std::uint64_t x = state += 0x9E3779B97F4A7C15;
    x = (x ^ (x >> 30)) * 0xBF58476D1CE4E5B9;
    x = (x ^ (x >> 27)) * 0x94D049BB133111EB;
    return x ^ (x >> 31);
  }

  /// Two numbers from one: below `first` and below `second`.
  struct Pair {
    std::uint32_t first;
    std::uint32_t second;
  };
  Pair Below(std::uint32_t first, std::uint32_t second) {
    const std::uint64_t x = (*this)();
    return {Scale(static_cast<std::uint32_t>(x), first),
            Scale(static_cast<std::uint32_t>(x >> 32), second)};
  }

private:
  static std::uint32_t Scale(std::uint32_t x, std::uint32_t limit) {
    return static_cast<std::uint32_t>((std::uint64_t{x} * limit) >> 32);
  }

  std::uint64_t state;
};

} // namespace Bench

#endif
