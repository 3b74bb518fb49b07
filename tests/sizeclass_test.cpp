#include "support/Reference.h"

#include "engine/SizeClasses.h"

#include <gtest/gtest.h>

using namespace VOK::MemPool;

namespace {

// One pool: its sizes, the class of each request, by the general mapping and by the fast index, and
// the way back from a class's record. Returns the first failure in words.
std::string Sweep(const Reference::Settings& given) {
  const Reference::Settings s = given.Normalised();
  const RecSizeRange range = Normalise(given.minRecSize, given.maxRecSize, given.dataAlignment);
  if (range.min != s.minRecSize || range.max != s.maxRecSize) return "the sizes";
  const std::uint32_t none = s.NumGroups();
  std::vector<std::uint32_t> capacity(none); // 0 for a class that no size reaches
  for (std::uint32_t size = s.dataAlignment; size + 4 <= s.maxRecSize; size += s.dataAlignment)
    capacity[s.Index(size)] = size;
  if (capacity[0] != 0 &&
      LargestAtIndex0(s.minRecSize, s.maxRecSize, s.dataAlignment) != capacity[0])
    return "index 0";

  const FastIndex fast = MakeFastIndex(s.minRecSize, s.maxRecSize, s.dataAlignment);
  const bool isFast = fast.shift != noFastIndex.shift;
  for (std::uint32_t size = 0; size <= s.maxRecSize + 20; ++size) {
    const std::uint32_t data = s.Rounded(size);
    const std::uint32_t index = data + 4 <= s.maxRecSize ? s.Index(data) : none;
    const std::uint32_t quickly = fast.IndexOf(size);
    const bool mustBeFast = isFast && size > 0 && data + 4 >= s.minRecSize && index < none;
    if (RoundUp(size, s.dataAlignment) != data ||
        (index < none && RecSizeIndex(data, s.minRecSize, s.dataAlignment) != index))
      return "size " + std::to_string(size);
    if (quickly != index && (mustBeFast || (quickly < none && capacity[quickly] != 0)))
      return "size " + std::to_string(size) + " by the fast index";
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
        const Reference::Settings settings{65535, alignment, max, min, false, true};
        if (!settings.IsPossible() || settings.Normalised().maxRecSize == 0) continue;
        EXPECT_EQ(Sweep(settings), "")
            << "alignment " << alignment << ", minimum " << min << ", maximum " << max;
      }
  for (const std::uint32_t alignment : {1u, 2u, 4u, 8u, 16u, 64u})
    EXPECT_NE(MakeFastIndex(RoundUp(8u, alignment), 1024, alignment).shift, noFastIndex.shift);
}

} // namespace
