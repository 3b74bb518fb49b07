#include "support/Pools.h"

namespace {

using namespace VOK::MemPool;

using Vector = VOK::vector<std::uint32_t>;

static_assert(offsetof(Vector, elems) == 0 && offsetof(Vector, count) == sizeof(void*) &&
              offsetof(Vector, capacity) == sizeof(void*) + 4);

// Each block is of the exact size, and the old one is freed after the copying. Where memory runs
// out nothing has changed.
TEST_F(Pools, VectorGrowsByItsRules) {
  std::vector<std::uint32_t> expected;
  {
    Vector v;
    // Appends a new number or, of the block that goes, an own one; or reserves as many.
    for (const char step : std::string("0nnnno8;3nnnnnnn")) {
      const std::uint32_t number = step == 'o' ? v[1] : 100 + v.count;
      const std::uint32_t capacity = v.capacity;
      const auto act = [&] {
        const ArenaHeap::Use use;
        step == 'n'   ? v.Append(number)
        : step == 'o' ? v.Append(v[1])
                      : v.Reserve(static_cast<std::uint32_t>(step - '0'));
      };
      heap.FailAt(1);
      try {
        act();
      } catch (const std::bad_alloc&) {
        EXPECT_TRUE(std::ranges::equal(v, expected) && v.capacity == capacity);
        act();
      }
      if (step >= 'n') expected.push_back(number);
      EXPECT_TRUE(std::ranges::equal(v, expected) && v.count == expected.size());
    }
    EXPECT_TRUE(v.capacity == 22 && v[11] == 111);
  }
  std::string blocks;
  for (const ArenaHeap::Event& event : heap.events)
    blocks += event.kind + std::to_string(event.size / 4) + " ";
  EXPECT_EQ(blocks, "!1 +1 !2 +2 -1 !4 +4 -2 !8 +8 -4 !11 +11 -8 !22 +22 -11 -22 ");
  Vector full;
  full.count = full.capacity = 0x80000000;
  EXPECT_THROW(full.Append(1), std::bad_alloc) << "doubling beyond the range of count";
}

} // namespace
