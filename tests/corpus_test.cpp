// The corpus of a fuzz target, replayed.
#include "Target.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <vector>

TEST(Corpus, VOK_MEMPOOL_TARGET) {
  unsigned count = 0;
  for (const auto& entry : std::filesystem::directory_iterator(VOK_MEMPOOL_CORPUS)) {
    SCOPED_TRACE(entry.path());
    std::ifstream file(entry.path(), std::ios::binary);
    const std::vector<char> bytes{std::istreambuf_iterator<char>(file), {}};
    LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
    ++count;
  }
  EXPECT_GE(count, 5u);
}
