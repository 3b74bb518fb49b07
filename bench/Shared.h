// The workloads of an allocator that several threads share: one thread frees what another one
// allocated. The sums don't depend on the order in which the threads run.
#ifndef VOK_BENCH_SHARED_H
#define VOK_BENCH_SHARED_H

#include "Record.h"
#include "Records.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstring>
#include <semaphore>
#include <thread>
#include <utility>
#include <vector>

namespace Bench {

/// One thread allocates records, and another one frees them in the same order, in batches that pass
/// through a queue.
template <class Allocator>
class Handover {
public:
  explicit Handover(std::uint32_t size_) : size(size_) {}

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    std::thread consumer([&] {
      for (std::uint32_t done = 0; done < times; done += batchSize) {
        numFull.acquire();
        for (void* const p : BatchOf(done))
          if (p != nullptr) sum += FreeRecord(allocator, {p, size});
        numEmpty.release();
      }
    });
    for (std::uint32_t done = 0; done < times; done += batchSize) {
      numEmpty.acquire();
      for (std::uint32_t i = 0; i < batchSize; ++i)
        BatchOf(done)[i] = done + i < times ? AllocRecord(allocator, size, done + i).p : nullptr;
      numFull.release();
    }
    consumer.join();
    return sum;
  }

private:
  static constexpr std::uint32_t batchSize = 256;
  static constexpr std::uint32_t numBatches = 16;
  using Batch = std::array<void*, batchSize>;

  Batch& BatchOf(std::uint32_t done) { return batches[done / batchSize % numBatches]; }

  Allocator allocator;
  std::uint32_t size;
  std::array<Batch, numBatches> batches;
  std::counting_semaphore<numBatches> numEmpty{numBatches};
  std::counting_semaphore<numBatches> numFull{0};
};

/// Two threads replace records in the same slots, picked at random; a record's first bytes have its
/// size.
template <class Allocator>
class Exchange {
public:
  explicit Exchange(std::uint32_t live) : sizes(RealisticSizes(0)), slots(live) {}

  std::uint32_t Run(std::uint32_t times) {
    std::array<std::uint32_t, 2> sums{};
    std::thread other([&] { sums[0] = Replace(1, times); });
    sums[1] = Replace(2, times);
    other.join();
    for (std::atomic<void*>& slot : slots)
      sums[0] += FreeSized(slot.exchange(nullptr));
    return sums[0] + sums[1];
  }

private:
  std::uint32_t Replace(std::uint64_t seed, std::uint32_t times) {
    Random random(seed);
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      const auto [place, draw] = random.Below(static_cast<std::uint32_t>(slots.size()), 1000);
      const Block block = AllocRecord(allocator, sizes[draw], time);
      std::memcpy(block.p, &block.size, sizeof block.size);
      sum += FreeSized(slots[place].exchange(block.p));
    }
    return sum;
  }

  std::uint32_t FreeSized(void* p) {
    if (p == nullptr) return 0;
    std::uint32_t size = 0;
    std::memcpy(&size, p, sizeof size);
    return FreeRecord(allocator, {p, size});
  }

  Allocator allocator;
  std::vector<std::uint32_t> sizes;
  std::vector<std::atomic<void*>> slots;
};

/// As Larson and Krishnan's server: two threads replace records of an array each, picked at random,
/// and after 20,000 of them end; the next two take the arrays over, crosswise.
template <class Allocator>
class Larson {
public:
  explicit Larson(std::uint32_t live) : sizes(RealisticSizes(0)) {
    for (Array& array : arrays) {
      array.random = Random(live + static_cast<std::uint64_t>(&array - arrays.data()));
      array.blocks.resize(live);
      Replace(array, live);
    }
  }

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    constexpr std::uint32_t perThread = 20'000;
    for (std::uint32_t done = 0; done < times; done += perThread) {
      const std::uint32_t count = std::min(perThread, times - done);
      std::array<std::uint32_t, 2> sums{};
      std::thread first([&] { sums[0] = Replace(arrays[0], count); });
      std::thread second([&] { sums[1] = Replace(arrays[1], count); });
      first.join();
      second.join();
      sum += sums[0] + sums[1];
      std::swap(arrays[0], arrays[1]);
    }
    return sum;
  }

private:
  struct Array {
    Random random{0};
    std::vector<Block> blocks;
  };

  std::uint32_t Replace(Array& array, std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      const auto [place, draw] =
          array.random.Below(static_cast<std::uint32_t>(array.blocks.size()), 1000);
      Block& block = array.blocks[place];
      if (block.p != nullptr) sum += FreeRecord(allocator, block);
      block = AllocRecord(allocator, sizes[draw], time);
    }
    return sum;
  }

  Allocator allocator;
  std::vector<std::uint32_t> sizes;
  std::array<Array, 2> arrays;
};

} // namespace Bench

#endif
