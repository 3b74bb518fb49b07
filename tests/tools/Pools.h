// Pools that work at random, for the tests of the tools: what the library writes about them is what
// the tools read.
#ifndef VOK_MEMPOOL_TESTS_TOOLS_POOLS_H
#define VOK_MEMPOOL_TESTS_TOOLS_POOLS_H

#include <MemPool>

#include <iostream>
#include <map>
#include <memory>
#include <random>
#include <sstream>
#include <string>
#include <vector>

/// Catches std::cout while it lives, from the state of a fresh stream, and puts it back.
class Captured {
public:
  Captured() : before(std::cout.rdbuf(text.rdbuf())) {
    state.copyfmt(std::cout);
    std::cout.copyfmt(std::ios(nullptr));
  }
  ~Captured() {
    std::cout.rdbuf(before);
    std::cout.copyfmt(state);
  }
  std::string Get() const { return text.str(); }

private:
  std::ostringstream text;
  std::streambuf* const before;
  std::ios state{nullptr};
};

/// Numbers that are the same in every run of a seed.
class Random {
public:
  explicit Random(unsigned seed) : engine(seed) {}
  unsigned operator()() { return static_cast<unsigned>(engine()); }

private:
  std::mt19937 engine;
};

/// What a pool is built from. The sizes are such that every request but 0 has a record or an
/// ext record that can go back.
struct PoolSettings {
  unsigned bucketSize = 4010, dataAlignment = 4, maxRecordSize = 1000, minRecordSize = 8;
  bool keepEmptyBuckets = false, isOff = false;

  void Apply() const {
    using namespace VOK::MemPool;
    ZOR_VOK_MEMPOOL_BUCKET_SIZE(bucketSize);
    ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(dataAlignment);
    ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(maxRecordSize);
    ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(minRecordSize);
    ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(keepEmptyBuckets);
    ZOR_VOK_MEMPOOL_OFF(isOff);
    ZOR_VOK_MEMPOOL_TRACE(false);
  }

  static PoolSettings Any(Random& random) {
    PoolSettings settings;
    const unsigned alignments[] = {1, 2, 3, 4, 4, 4, 8, 16};
    settings.dataAlignment = alignments[random() % 8];
    settings.minRecordSize = 4 + random() % 40;
    settings.maxRecordSize = settings.minRecordSize + 2 * settings.dataAlignment + random() % 200;
    settings.bucketSize = settings.maxRecordSize + 4 + random() % 1500;
    settings.keepEmptyBuckets = random() % 2 == 0;
    return settings;
  }
};

/// A pool, and what its caller holds.
struct WorkedPool {
  VOK::MemPool::Mgr mgr;
  std::vector<void*> held;

  explicit WorkedPool(const std::string& name) : mgr(name.c_str()) {}

  void Alloc(unsigned size) { held.push_back(mgr.Alloc(size)); }

  void FreeAny(Random& random) {
    if (held.empty()) return;
    std::swap(held[random() % held.size()], held.back());
    mgr.Free(held.back());
    held.pop_back();
  }

  /// `steps` requests and Frees of one size mix.
  void Work(Random& random, unsigned steps, unsigned largest) {
    for (unsigned i = 0; i < steps; ++i)
      if (random() % 5 < 3)
        Alloc(1 + random() % (random() % 8 == 0 ? 2 * largest : largest / 3));
      else
        FreeAny(random);
  }
};

#endif
