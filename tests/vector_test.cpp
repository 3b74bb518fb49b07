#include "support/ArenaHeap.h"

#include "MemPool"

#include <cstddef>
#include <gtest/gtest.h>
#include <new>

namespace {

using Vector = VOK::vector<std::uint32_t>;

static_assert(offsetof(Vector, elems) == 0 && offsetof(Vector, count) == sizeof(void*) &&
              offsetof(Vector, capacity) == sizeof(void*) + 4);

// Each block is of the exact size, and the old one goes back behind the copying.
TEST(Vector, GrowsByItsRules) {
  ArenaHeap heap;
  std::vector<std::size_t> blocks;
  {
    const ArenaHeap::Use use;
    Vector v;
    v.Reserve(0);
    for (std::uint32_t i = 0; i < 4; ++i)
      v.Append(100 + i);
    v.Append(v[1]); // of the block that goes
    v.Reserve(8);
    v.Reserve(11);
    v.Reserve(3);
    for (std::uint32_t i = 5; i < 12; ++i)
      v.Append(100 + i);
    const ArenaHeap::Use real(false);
    EXPECT_EQ(
        std::vector<std::uint32_t>(v.begin(), v.end()),
        (std::vector<std::uint32_t>{100, 101, 102, 103, 101, 105, 106, 107, 108, 109, 110, 111}));
    EXPECT_TRUE(v.count == 12 && v.capacity == 22 && v[11] == 111);
  }
  for (const ArenaHeap::Event& event : heap.events)
    blocks.push_back(event.kind == '+' ? event.size / 4 : 1000 + event.size / 4);
  EXPECT_EQ(blocks,
            (std::vector<std::size_t>{1, 2, 1001, 4, 1002, 8, 1004, 11, 1008, 22, 1011, 1022}));
  EXPECT_TRUE(heap.Finish().empty());
}

TEST(Vector, OutOfMemoryChangesNothing) {
  ArenaHeap heap;
  Vector v;
  {
    const ArenaHeap::Use use;
    v.Append(7);
  }
  const auto fails = [&](auto call) {
    std::uint32_t* const elems = v.elems;
    heap.FailAt(1);
    try {
      const ArenaHeap::Use use;
      call();
    } catch (const std::bad_alloc&) {
      return v.elems == elems && v.count == 1 && v.capacity == 1 && v[0] == 7;
    }
    return false;
  };
  EXPECT_TRUE(fails([&] { v.Append(8); }));
  EXPECT_TRUE(fails([&] { v.Reserve(2); }));
  Vector full;
  full.count = full.capacity = 0x80000000;
  EXPECT_THROW(full.Append(1), std::bad_alloc) << "doubling beyond the range of count";
  EXPECT_EQ(full.capacity, 0x80000000);
}

} // namespace
