#include "support/ArenaHeap.h"

#include "MemPool"

#include <cstddef>
#include <gtest/gtest.h>
#include <new>

namespace {

using Vector = VOK::vector<std::uint32_t>;

static_assert(offsetof(Vector, elems) == 0 && offsetof(Vector, count) == sizeof(void*) &&
              offsetof(Vector, capacity) == sizeof(void*) + 4);

// Each block is of the exact size, and the old one is released after the copying. Where memory runs
// out nothing has changed.
TEST(Vector, GrowsByItsRules) {
  ArenaHeap heap;
  {
    Vector v;
    const auto once = [](const auto& call) {
      const ArenaHeap::Use use;
      call();
    };
    const auto twice = [&](const auto& call) {
      const std::vector<std::uint32_t> before(v.begin(), v.end());
      const unsigned capacity = v.capacity;
      heap.FailAt(1);
      try {
        once(call);
      } catch (const std::bad_alloc&) {
        EXPECT_TRUE(std::equal(v.begin(), v.end(), before.begin(), before.end()));
        EXPECT_EQ(v.capacity, capacity);
        once(call);
      }
    };
    twice([&] { v.Reserve(0); });
    for (std::uint32_t i = 0; i < 4; ++i)
      twice([&] { v.Append(100 + i); });
    twice([&] { v.Append(v[1]); }); // of the block that goes
    for (const unsigned room : {8u, 11u, 3u})
      twice([&] { v.Reserve(room); });
    for (std::uint32_t i = 5; i < 12; ++i)
      twice([&] { v.Append(100 + i); });
    EXPECT_EQ(
        std::vector<std::uint32_t>(v.begin(), v.end()),
        (std::vector<std::uint32_t>{100, 101, 102, 103, 101, 105, 106, 107, 108, 109, 110, 111}));
    EXPECT_TRUE(v.count == 12 && v.capacity == 22 && v[11] == 111);
  }
  std::string blocks;
  for (const ArenaHeap::Event& event : heap.events)
    blocks += event.kind + std::to_string(event.size / 4) + " ";
  EXPECT_EQ(blocks, "!1 +1 !2 +2 -1 !4 +4 -2 !8 +8 -4 !11 +11 -8 !22 +22 -11 -22 ");
  EXPECT_TRUE(heap.Finish().empty());
  Vector full;
  full.count = full.capacity = 0x80000000;
  EXPECT_THROW(full.Append(1), std::bad_alloc) << "doubling beyond the range of count";
}

} // namespace
