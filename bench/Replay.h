// The workload of a recorded program: its calls in their order, on a pool that each run constructs
// and destroys, as the program would.
#ifndef VOK_BENCH_REPLAY_H
#define VOK_BENCH_REPLAY_H

#include "Mapped.h"
#include "Record.h"
#include "Trace.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

namespace Bench {

/// The live blocks of a program under replay. `Filling` says whether a new block is written whole
/// or at its ends.
template <class Allocator, bool Filling>
class Program {
public:
  Program(Allocator& allocator_, MappedVector<Block>& blocks_)
      : allocator(allocator_), blocks(blocks_) {}

  /// Does a call; `value` is the data of a new block.
  void Do(const Trace::Event& event, std::uint32_t value) {
    Block& block = blocks[event.slot];
    switch (event.call) {
    case Trace::Free:
      return Drop(block);
    case Trace::Realloc:
      return Move(block, event.size, value);
    case Trace::Alloc:
      block = {allocator.Alloc(event.size), event.size};
      break;
    case Trace::Calloc:
      block = {allocator.Alloc(event.size), event.size};
      if (event.size != 0) std::memset(block.p, 0, event.size);
      break;
    }
    Fill(block, value);
  }

  /// Frees what is live, and returns the sum of the data read since the start.
  std::uint32_t End() {
    for (Block& block : blocks)
      if (block.p != nullptr) Drop(block);
    return sum;
  }

private:
  void Drop(Block& block) {
    sum += FreeRecord(allocator, block);
    block = {};
  }

  void Move(Block& block, std::uint32_t size, std::uint32_t value) {
    const Block fresh{allocator.Alloc(size), size};
    const std::uint32_t held = std::min(size, block.size);
    if (held != 0) std::memcpy(fresh.p, block.p, held);
    Drop(block);
    block = fresh;
    Fill(block, value);
  }

  void Fill(const Block& block, std::uint32_t value) {
    if (Filling && block.size != 0) std::memset(block.p, 1, block.size);
    Write(block.p, block.size, value);
  }

  Allocator& allocator;
  MappedVector<Block>& blocks;
  std::uint32_t sum = 0;
};

/// Allocates and frees a large block, as a program that continues soon does. Until then glibc keeps
/// small freed blocks apart and returns none of them to the system.
inline void SettleHeap() {
  void* volatile const p = std::malloc(100'000); // else the compiler sees that it does nothing
  std::free(p);
}

template <class Allocator>
class Replay {
public:
  explicit Replay(const std::string& path) : trace(path), blocks(trace.slots) {}

  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      sum += RunOnce(time);
      SettleHeap();
    }
    return sum;
  }

private:
  std::uint32_t RunOnce(std::uint32_t value) {
    Allocator allocator;
    Program<Allocator, false> program(allocator, blocks);
    for (const Trace::Event& event : trace.events)
      program.Do(event, value++);
    return program.End();
  }

  Trace trace;
  MappedVector<Block> blocks;
};

} // namespace Bench

#endif
