// The workloads of plain records. Each is constructed before the clock runs; Run(times) does its
// work `times` times and returns the sum of the data read.
#ifndef VOK_BENCH_RECORDS_H
#define VOK_BENCH_RECORDS_H

#include "Record.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <numeric>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace Bench {

/// Allocates `depth` records and frees them in reverse, over `live` others that stay.
template <class Allocator>
class Lifo {
public:
  Lifo(std::uint32_t size_, std::uint32_t depth, std::uint32_t live)
      : size(size_), others(live), records(depth) {
    for (void*& p : others)
      p = AllocRecord(allocator, size, 0).p;
  }

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      for (void*& p : records)
        p = AllocRecord(allocator, size, time).p;
      for (std::size_t i = records.size(); i-- > 0;)
        sum += FreeRecord(allocator, {records[i], size});
    }
    return sum;
  }

private:
  Allocator allocator;
  std::uint32_t size;
  std::vector<void*> others; // they live as long as the process
  std::vector<void*> records;
};

/// Allocates `count` records and frees them in the same order, in reverse or at random.
template <class Allocator>
class Bulk {
public:
  Bulk(std::uint32_t size_, std::uint32_t count, const std::string& order)
      : size(size_), records(count), places(count) {
    std::iota(places.begin(), places.end(), 0);
    if (order == "reverse")
      std::reverse(places.begin(), places.end());
    else if (order == "random")
      Shuffle();
    else if (order != "order")
      throw std::invalid_argument("no such order: " + order);
  }

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      for (void*& p : records)
        p = AllocRecord(allocator, size, time).p;
      for (const std::uint32_t place : places)
        sum += FreeRecord(allocator, {records[place], size});
    }
    return sum;
  }

private:
  // By hand, since std::shuffle differs between libraries.
  void Shuffle() {
    Random random(1);
    for (auto i = static_cast<std::uint32_t>(places.size()); i > 1; --i)
      std::swap(places[i - 1], places[random.Below(i, 1).first]);
  }

  Allocator allocator;
  std::uint32_t size;
  std::vector<void*> records;
  std::vector<std::uint32_t> places;
};

/// A thousand sizes to draw from, mostly small as in most programs: a median of 40, a mean of 64,
/// 93 % up to 128. Of these `large` in a thousand lie between 1 and 64 KiB, as many in each
/// doubling.
inline std::vector<std::uint32_t> RealisticSizes(std::uint32_t large) {
  struct Share {
    std::uint32_t size;
    std::uint32_t perMille;
  };
  static constexpr Share shares[] = {{8, 50},   {16, 120}, {24, 150}, {32, 140}, {40, 110},
                                     {48, 100}, {56, 60},  {64, 70},  {80, 50},  {96, 40},
                                     {128, 40}, {200, 30}, {300, 20}, {500, 15}, {900, 5}};
  std::vector<std::uint32_t> sizes;
  for (const Share& share : shares)
    sizes.insert(sizes.end(), share.perMille, share.size);
  for (std::uint32_t i = 0; i < large; ++i) {
    const std::uint32_t doubling = 1024U << i % 6;
    sizes[i * (1000 / large)] = doubling + doubling / large * i;
  }
  return sizes;
}

/// Replaces one of `live` records of realistic sizes, picked at random, by another.
template <class Allocator>
class Churn {
public:
  Churn(std::uint32_t live, std::uint32_t large)
      : sizes(RealisticSizes(large)), random(live), blocks(live) {
    for (Block& block : blocks)
      block = AllocRecord(allocator, sizes[random.Below(1, 1000).second], 0);
  }

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      const auto [place, draw] = random.Below(static_cast<std::uint32_t>(blocks.size()), 1000);
      Block& block = blocks[place];
      sum += FreeRecord(allocator, block);
      block = AllocRecord(allocator, sizes[draw], time);
    }
    return sum;
  }

private:
  Allocator allocator;
  std::vector<std::uint32_t> sizes;
  Random random;
  std::vector<Block> blocks;
};

/// Churn in each of `count` threads, each with a pool of its own.
template <class Allocator>
class Threads {
public:
  Threads(std::uint32_t count, std::uint32_t live) : sums(count) {
    for (std::uint32_t i = 0; i < count; ++i)
      churns.push_back(std::make_unique<Churn<Allocator>>(live, 0));
  }

  std::uint32_t Run(std::uint32_t times) {
    std::vector<std::thread> threads;
    for (std::size_t i = 0; i < churns.size(); ++i)
      threads.emplace_back([this, i, times] { sums[i] = churns[i]->Run(times); });
    for (std::thread& thread : threads)
      thread.join();
    return std::accumulate(sums.begin(), sums.end(), std::uint32_t{0});
  }

private:
  std::vector<std::unique_ptr<Churn<Allocator>>> churns;
  std::vector<std::uint32_t> sums;
};

/// Builds `count` records and frees all of them at once by the allocator's own call: by Reset,
/// which keeps the memory, if `resets`, else by Clear. An allocator without that call frees each
/// record.
template <class Allocator>
class Drop {
public:
  Drop(std::uint32_t size_, std::uint32_t count, bool resets_)
      : size(size_), resets(resets_), records(count) {}

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      for (void*& p : records)
        p = AllocRecord(allocator, size, time).p;
      for (std::size_t i = 0; i < records.size(); i += sample)
        sum += Read(records[i], size);
      FreeAll();
    }
    return sum;
  }

private:
  void FreeAll() {
    if constexpr (requires { allocator.Reset(); }) {
      if (resets) return allocator.Reset();
    }
    if constexpr (requires { allocator.Clear(); }) {
      if (!resets) return allocator.Clear();
    }
    for (void* const p : records)
      allocator.Free(p, size);
  }

  // Reading every record would hide what an allocator gains by not visiting each.
  static constexpr std::size_t sample = 64;

  Allocator allocator;
  std::uint32_t size;
  bool resets;
  std::vector<void*> records;
};

} // namespace Bench

#endif
