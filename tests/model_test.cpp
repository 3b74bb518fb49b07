// The library against the reference: a random run of several pools, and on small buckets every
// sequence of calls. VOK_MEMPOOL_SEED and VOK_MEMPOOL_STEPS in the environment set the random run.
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

// Of up to nine requests and releases, on buckets of one, two and three records of 8 bytes.
TEST(Model, AllSequences) {
  ArenaHeap heap;
  std::vector<int> bytes;
  const std::function<void(unsigned, int)> run = [&](unsigned depth, int numLive) {
    if (depth == 0) {
      auto byte = bytes.begin();
      Operations(heap, [&] { return byte != bytes.end() ? *byte++ : -1; }).Run();
      return;
    }
    for (int choice = -1; choice < numLive; ++choice) {
      const auto op = choice < 0 ? std::pair(255, 4) : std::pair(60, choice);
      bytes.insert(bytes.end(), {op.first, op.second});
      run(depth - 1, numLive + (choice < 0 ? 1 : -1));
      bytes.resize(bytes.size() - 2);
    }
  };
  for (const int bucketSize : {12, 18, 26})
    for (const int keep : {0, 1}) {
      bytes = {3, 0, bucketSize - 12, 0, 0, 8, 8, 2 + keep};
      run(8, 0);
    }
}

} // namespace
