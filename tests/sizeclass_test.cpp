#include "engine/SizeClasses.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <optional>
#include <vector>

using namespace VOK::MemPool;

namespace {

TEST(SizeClasses, RoundUp) {
  constexpr std::uint32_t cases[][3] = {
      {0, 8, 8},        {1, 8, 8},   {8, 8, 8},
      {9, 8, 16},       {24, 4, 24}, {0, 1, 1},
      {7, 1, 7},        {10, 3, 12}, {maxRequest, 65535, 1073790975},
      {1, 65535, 65535}};
  for (const auto& [value, multiple, wanted] : cases)
    EXPECT_EQ(RoundUp(value, multiple), wanted) << value << " to " << multiple;
  EXPECT_EQ(RoundUp(std::uint64_t{UINT32_MAX}, 4), 0x100000000);
}

TEST(SizeClasses, Normalise) {
  const struct {
    std::uint32_t min, max, alignment;
    std::uint64_t wantedMin, wantedMax;
  } cases[] = {{8, 1000, 4, 8, 1000},
               {8, 1001, 4, 8, 1000},
               {9, 1000, 4, 12, 1000},
               {0, 1003, 4, 4, 1000},
               {8, 3, 4, 8, 0},
               {8, 0, 4, 8, 0},
               {5, 999, 1, 5, 999},
               {7, 100, 24, 24, 96},
               {UINT32_MAX, UINT32_MAX, 4, 0x100000000, 4294967292},
               {UINT32_MAX, UINT32_MAX, 1, UINT32_MAX, UINT32_MAX}};
  for (const auto& c : cases) {
    const RecSizeRange range = Normalise(c.min, c.max, c.alignment);
    EXPECT_TRUE(range.min == c.wantedMin && range.max == c.wantedMax)
        << c.min << ", " << c.max << " to " << c.alignment << ": " << range.min << ", "
        << range.max;
  }
}

// The written rule, in its own words: the index of a request's class, none above the largest
// record.
struct Rule {
  std::uint32_t min, max, alignment;

  std::uint32_t Rounded(std::uint32_t size) const {
    return std::max((size + alignment - 1) / alignment, 1u) * alignment;
  }
  std::optional<std::uint32_t> IndexOf(std::uint32_t size) const {
    const std::uint32_t record = Rounded(size) + 4;
    if (record > max) return std::nullopt;
    return (std::max(record, min) - min) / alignment;
  }
};

// One pool: the records that its classes hold, all sizes, and the way back from a record's size.
// Returns the first failure in words.
std::string Sweep(std::uint32_t min, std::uint32_t max, std::uint32_t alignment) {
  const Rule rule{min, max, alignment};
  const std::uint32_t numGroups = (max - min) / alignment + 1;
  std::vector<std::uint32_t> held(numGroups); // 0 for a class that no size reaches
  for (std::uint32_t size = alignment; size + 4 <= max; size += alignment) {
    const std::uint32_t index = rule.IndexOf(size).value();
    if (index >= numGroups) return "no class for " + std::to_string(size);
    if (index > 0 && held[index] != 0) return "two sizes above index 0 share a class";
    held[index] = size;
  }
  if (held[0] != 0 && LargestAtIndex0(min, max, alignment) != held[0]) return "index 0";

  const IndexRule quick = MakeIndexRule(min, max, alignment);
  for (std::uint32_t size = 0; size <= max + 20; ++size) {
    const std::uint32_t data = RoundUp(size, alignment);
    const std::optional<std::uint32_t> index = rule.IndexOf(size);
    const std::string place = "size " + std::to_string(size);
    if (data != rule.Rounded(size)) return place + " is rounded wrongly";
    if (index && RecSizeIndex(data, min, alignment) != *index) return place + " by the rule";
    if (index && held[*index] < size) return place + " doesn't fit in its class";
    if (index && RecSizeIndex(RoundUp(held[*index], alignment), min, alignment) != *index)
      return place + " doesn't find back";
    const std::uint32_t quickly = quick.IndexOf(size);
    if (quickly < numGroups && held[quickly] != 0 && quickly != index)
      return place + " the short way";
  }
  return "";
}

TEST(SizeClasses, EverySizeOfManyPools) {
  std::vector<std::uint32_t> alignments{24, 32, 100, 128, 256, 1000, 4096, 32768, 65535};
  for (std::uint32_t alignment = 1; alignment <= 17; ++alignment)
    alignments.push_back(alignment);
  for (const std::uint32_t alignment : alignments)
    for (const std::uint32_t min :
         {0u, 4u, 5u, 8u, 9u, 13u, 24u, 33u, 40u, 64u, 127u, 129u, 520u, 1000u, 65531u})
      for (const std::uint32_t max :
           {3u, 8u, 12u, 16u, 20u, 40u, 130u, 500u, 1000u, 4006u, 65531u}) {
        if (max == 65531 && min != 8 && min != 520 && min != 65531) continue; // these take long
        const RecSizeRange range = Normalise(min, max, alignment);
        if (range.min > range.max || range.max < 1) continue;
        EXPECT_EQ(Sweep(static_cast<std::uint32_t>(range.min),
                        static_cast<std::uint32_t>(range.max), alignment),
                  "")
            << "alignment " << alignment << ", minimum " << min << ", maximum " << max;
      }
}

// Pools whose sizes all go the short way, apart from 0, what is lifted and what is too large.
TEST(SizeClasses, ShortWayIsTaken) {
  for (const std::uint32_t alignment : {1u, 2u, 4u, 8u, 16u, 64u}) {
    const std::uint32_t min = RoundUp(8u, alignment);
    const std::uint32_t max = 1024;
    const Rule rule{min, max, alignment};
    for (std::uint32_t size = 1; size + 4 <= max; ++size) {
      if (!rule.IndexOf(size) || rule.Rounded(size) + 4 < min) continue;
      EXPECT_EQ(MakeIndexRule(min, max, alignment).IndexOf(size), *rule.IndexOf(size))
          << "size " << size << ", alignment " << alignment;
    }
  }
  EXPECT_EQ(MakeIndexRule(8, 999, 3).shift, noIndexRule.shift);
}

} // namespace
