// The library against the reference: a random run of several pools, which VOK_MEMPOOL_SEED and
// VOK_MEMPOOL_STEPS in the environment set.
#include "support/Operations.h"

#include <gtest/gtest.h>
#include <random>

namespace {

unsigned Number(const char* key, unsigned otherwise) {
  const char* const text = std::getenv(key);
  return text != nullptr ? static_cast<unsigned>(std::strtoul(text, nullptr, 10)) : otherwise;
}

TEST(Model, RandomRun) {
  const unsigned seed = Number("VOK_MEMPOOL_SEED", std::random_device()());
  const unsigned numSteps = Number("VOK_MEMPOOL_STEPS", VOK_MEMPOOL_EMULATED ? 50000 : 200000);
  std::printf("VOK_MEMPOOL_SEED=%u VOK_MEMPOOL_STEPS=%u\n", seed, numSteps);
  std::mt19937 generator(seed);
  ArenaHeap heap;
  Operations* running = nullptr;
  Operations operations(heap, [&] {
    return running->numCalls < numSteps ? static_cast<int>(generator() % 256) : -1;
  });
  running = &operations;
  try {
    operations.Run(64);
  } catch (const std::logic_error& error) {
    FAIL() << error.what() << ", call " << operations.numCalls << " of seed " << seed;
  }
}

} // namespace
