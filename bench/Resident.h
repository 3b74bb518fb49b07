// The memory workloads: how much the resident set of a process grows for a payload that is written
// whole, and how much of that growth is left when all is freed.
#ifndef VOK_BENCH_RESIDENT_H
#define VOK_BENCH_RESIDENT_H

#include "Mapped.h"
#include "Record.h"
#include "Replay.h"
#include "Trace.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <stdexcept>
#include <string>

namespace Bench {

struct Growth {
  std::uint64_t payload;
  std::int64_t grown; ///< bytes with the whole payload live
  std::int64_t left;  ///< bytes with all of it freed
  std::uint32_t sum;
};

/// The resident bytes of this process, read without a call to the heap.
inline std::int64_t ResidentBytes() {
  char text[128] = {};
  const int file = open("/proc/self/statm", O_RDONLY | O_CLOEXEC);
  const ssize_t length = file < 0 ? -1 : read(file, text, sizeof text - 1);
  if (file >= 0) close(file);
  const char* const second = length < 0 ? nullptr : std::strchr(text, ' ');
  if (second == nullptr) throw std::runtime_error("cannot read /proc/self/statm");
  return std::strtoll(second, nullptr, 10) * sysconf(_SC_PAGESIZE);
}

/// Allocates a million records of one size and frees them in the same order.
template <class Allocator>
Growth GrowthOfRecords(std::uint32_t size) {
  MappedVector<void*> records(1'000'000); // its zeroes make it resident
  const std::int64_t before = ResidentBytes();
  Allocator allocator;
  for (void*& p : records) {
    p = allocator.Alloc(size);
    std::memset(p, 1, size);
  }
  Growth growth{std::uint64_t{size} * records.size(), ResidentBytes() - before, 0, 0};
  for (void* const p : records)
    growth.sum += FreeRecord(allocator, {p, size});
  SettleHeap();
  growth.left = ResidentBytes() - before;
  return growth;
}

/// Runs a recorded program; the peak of its payload gives the growth.
template <class Allocator>
Growth GrowthOfReplay(const std::string& path) {
  const Trace trace(path);
  MappedVector<Block> blocks(trace.slots);
  const std::int64_t before = ResidentBytes();
  Allocator allocator;
  Program<Allocator, true> program(allocator, blocks);
  Growth growth{trace.payload, 0, 0, 0};
  for (std::size_t i = 0; i < trace.events.size(); ++i) {
    program.Do(trace.events[i], static_cast<std::uint32_t>(i));
    if (i + 1 == trace.peak) growth.grown = ResidentBytes() - before;
  }
  growth.sum = program.End();
  SettleHeap();
  growth.left = ResidentBytes() - before;
  return growth;
}

} // namespace Bench

#endif
