// The library against models of it: a random run of several pools, and on small buckets every
// sequence of calls. VOK_MEMPOOL_SEED and VOK_MEMPOOL_STEPS in the environment set the random run.
#include "support/Script.h"

#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "engine/Invariants.h"
#include "services/Observers.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <gtest/gtest.h>
#include <memory>
#include <random>

using namespace VOK::MemPool;

namespace {

std::mt19937 generator;

unsigned Random(unsigned below) { return static_cast<unsigned>(generator() % below); }

struct Block {
  std::uint8_t* p;
  unsigned size;
  bool isExt;
  std::uint8_t pattern;
};

// A pool under random settings, with what it owes.
class ModelPool {
public:
  std::unique_ptr<Mgr> mgr;
  std::vector<Block> blocks;

  ModelPool() {
    do {
      alignment = std::vector{1u, 2u, 3u, 4u, 4u, 4u, 8u, 12u, 16u, 32u}[Random(10)];
      bucketSize = Random(20) == 0 ? 65535 + Random(2) : 12 + Random(800);
      min = (Random(60) + alignment - 1) / alignment * alignment;
      if (min == 0) min = alignment;
      max = Random(std::min(bucketSize, 65535u) - 3) / alignment * alignment;
    } while (min > max);
    keep = Random(2) == 0;
    on = Random(8) != 0;
    Set("bucket=" + std::to_string(bucketSize) + " align=" + std::to_string(alignment) +
        " max=" + std::to_string(max + Random(std::min(alignment, bucketSize - 3 - max))) +
        " min=" + std::to_string(min - Random(alignment)) + " keep=" + (keep ? "1" : "0") +
        " on=" + (on ? "1" : "0"));
    const ArenaHeap::Use use;
    mgr = std::make_unique<Mgr>();
  }

  // The data bytes that a request gets.
  unsigned Capacity(unsigned size) const {
    unsigned data = Rounded(size);
    if (data + 4 > max) return size;
    if (Index(data) > 0) return data;
    while (Index(data + alignment) == 0 && data + alignment + 4 <= max)
      data += alignment;
    return data;
  }

  // Each returns the first disagreement in words.
  std::string Alloc() {
    const unsigned size = Random(Random(10) == 0 ? max + 60 : std::min(max + 20, 100u));
    std::uint8_t* p = nullptr;
    {
      const ArenaHeap::Use use;
      p = static_cast<std::uint8_t*>(mgr->Alloc(size));
    }
    const Block block{p, size, on && Rounded(size) + 4 > max,
                      static_cast<std::uint8_t>(Random(256))};
    std::memset(p, block.pattern, size);
    if (block.isExt && size == 0)
      ++numLengthless; // stays until Clear, and no one can tell it
    else
      blocks.push_back(block);
    return Answers(block);
  }

  std::string Free(ModelPool& other) {
    const auto chosen =
        blocks.begin() + static_cast<std::ptrdiff_t>(Random(static_cast<unsigned>(blocks.size())));
    const Block block = *chosen;
    *chosen = blocks.back();
    blocks.pop_back();
    std::string answers = Answers(block);
    if (!answers.empty()) return answers;
    if (&other != this && on && !block.isExt) {
      if (other.mgr->GetSize(block.p) != 0 || other.mgr->Contains(block.p))
        return "a stranger knows it";
      if (other.on && other.mgr->Free(block.p)) return "a stranger frees it";
    }
    if (std::any_of(block.p, block.p + block.size,
                    [&](std::uint8_t byte) { return byte != block.pattern; }))
      return "its bytes have changed";
    if (!mgr->Free(block.p)) return "Free refuses it";
    if (on && !block.isExt && keep && (mgr->Free(block.p) || mgr->Contains(block.p)))
      return "it can be freed twice";
    return "";
  }

  void Clear() {
    mgr->Clear();
    if (!on) return;
    blocks.clear();
    numLengthless = 0;
  }

  // The whole pool, its counters too.
  std::string Check() const {
    const Observers::Quiet looking;
    const BucketMgr& pool = *mgr->GetBucketMgr();
    if (!IsValid(pool)) return "it is not valid";
    std::uint32_t numUsed = 0;
    std::uint32_t numBuckets = 0;
    for (std::uint32_t i = 0; i < pool.numGroups; ++i)
      for (const Bucket* b = pool.groups[i] != nullptr ? pool.groups[i]->head1 : nullptr;
           b != nullptr; b = b->next1) {
        numUsed += b->TotalRecs() - b->freeRecs;
        ++numBuckets;
      }
    const auto numExt = static_cast<std::uint32_t>(
        std::count_if(blocks.begin(), blocks.end(), [](const Block& b) { return b.isExt; }));
    if (pool.numExtRecs != numExt + numLengthless) return "the number of ExtRecs";
    if (pool.GetNumBuckets() != numBuckets) return "the number of buckets";
    return numUsed == (on ? blocks.size() - numExt : 0) ? "" : "the number of used records";
  }

  // A disabled pool's blocks stay when it goes.
  void FreeAll() {
    for (const Block& block : blocks)
      mgr->Free(block.p);
    blocks.clear();
  }

private:
  unsigned Rounded(unsigned size) const {
    return std::max((size + alignment - 1) / alignment, 1u) * alignment;
  }
  unsigned Index(unsigned data) const { return (std::max(data + 4, min) - min) / alignment; }

  std::string Answers(const Block& block) const {
    const unsigned size = !on ? 0 : block.isExt ? block.size : Capacity(block.size);
    if (mgr->GetSize(block.p) != size)
      return "GetSize of a request of " + std::to_string(block.size);
    return mgr->Contains(block.p) == (size != 0) ? "" : "Contains";
  }

  unsigned alignment, bucketSize, min, max, numLengthless = 0;
  bool keep, on;
};

unsigned Number(const char* key, unsigned otherwise) {
  const char* const text = std::getenv(key);
  return text != nullptr ? static_cast<unsigned>(std::strtoul(text, nullptr, 10)) : otherwise;
}

TEST(Model, RandomRun) {
  const bool isEmulated = *VOK_MEMPOOL_LAUNCHER != '\0';
  const unsigned seed = Number("VOK_MEMPOOL_SEED", std::random_device()());
  const unsigned numSteps = Number("VOK_MEMPOOL_STEPS", isEmulated ? 50000 : 1000000);
  std::printf("VOK_MEMPOOL_SEED=%u VOK_MEMPOOL_STEPS=%u\n", seed, numSteps);
  generator.seed(seed);
  const KeepSettings keep;
  ArenaHeap heap;
  {
    std::vector<std::unique_ptr<ModelPool>> pools(5);
    for (auto& pool : pools)
      pool = std::make_unique<ModelPool>();
    for (unsigned step = 0; step < numSteps; ++step) {
      std::unique_ptr<ModelPool>& pool = pools[Random(5)];
      std::string fault;
      const unsigned kind = Random(2000);
      if (kind == 0) {
        pool->FreeAll();
        pool.reset();
        pool = std::make_unique<ModelPool>();
      } else if (kind < 4) {
        pool->Clear();
      } else if (!pool->blocks.empty() && Random(160) < 60 + pool->blocks.size()) {
        fault = pool->Free(*pools[Random(5)]);
      } else {
        fault = pool->Alloc();
      }
      if (fault.empty() && (kind < 4 || step % 64 == 0)) fault = pool->Check();
      heap.events.clear();
      ASSERT_EQ(fault, "") << "step " << step << " of seed " << seed;
      ASSERT_TRUE(heap.faults.empty())
          << heap.faults[0] << ", step " << step << " of seed " << seed;
    }
    for (auto& pool : pools)
      pool->FreeAll();
  }
  EXPECT_EQ(heap.Finish(), std::vector<std::string>());
}

// The written rules of one class of two records to a bucket, at the offsets 2 and 10.
class Reference {
public:
  explicit Reference(bool keep_) : keep(keep_) {}

  std::pair<int, int> Alloc() {
    if (withFree.empty()) {
      all.insert(all.begin(), ++numMade);
      withFree.insert(withFree.begin(), numMade);
      chains[numMade] = {2, 10};
    }
    const int bucket = withFree.front();
    std::vector<int>& chain = chains[bucket];
    const int offset = chain.front();
    chain.erase(chain.begin());
    if (chain.empty()) withFree.erase(withFree.begin());
    return {bucket, offset};
  }

  void Free(std::pair<int, int> place) {
    const auto [bucket, offset] = place;
    std::vector<int>& chain = chains[bucket];
    const bool wasFull = chain.empty();
    chain.insert(chain.begin(), offset);
    if (chain.size() == 2 && !keep) {
      std::erase(all, bucket);
      std::erase(withFree, bucket);
    } else if (wasFull) {
      withFree.insert(withFree.begin(), bucket);
    }
  }

  // As a script shows it.
  std::string Show() const {
    std::string text = "; show a -> [0] 4:";
    for (const int bucket : all) {
      text += " #" + std::to_string(bucket) + "(";
      for (const int offset : chains.at(bucket))
        text += std::to_string(offset) + (offset == chains.at(bucket).back() ? "" : " ");
      text += ")";
    }
    text += " free";
    for (const int bucket : withFree)
      text += " #" + std::to_string(bucket);
    return text + " tail " + (all.empty() ? "-" : "#" + std::to_string(all.back())) + "\n";
  }

private:
  const bool keep;
  std::vector<int> all, withFree; // from the head
  std::map<int, std::vector<int>> chains;
  int numMade = 0;
};

void ExpectAllSequences(const Reference& reference, const std::map<int, std::pair<int, int>>& live,
                        const std::string& text, int depth) {
  if (depth == 0) return Expect(text);
  {
    Reference next = reference;
    std::map<int, std::pair<int, int>> more = live;
    const auto place = more[depth] = next.Alloc();
    ExpectAllSequences(next, more,
                       text + "alloc a p" + std::to_string(depth) + " 4 -> #" +
                           std::to_string(place.first) + "+" + std::to_string(place.second) +
                           next.Show(),
                       depth - 1);
  }
  for (const auto& [name, place] : live) {
    Reference next = reference;
    std::map<int, std::pair<int, int>> fewer = live;
    fewer.erase(name);
    next.Free(place);
    ExpectAllSequences(next, fewer,
                       text + "free a p" + std::to_string(name) + " -> true" + next.Show(),
                       depth - 1);
  }
}

TEST(Model, AllSequencesOnBucketsOfTwo) {
  for (const bool keep : {false, true})
    ExpectAllSequences(
        Reference(keep), {},
        std::string("set on=1 bucket=18 max=8 min=8 keep=") + (keep ? "1" : "0") + "\npool a\n", 8);
}

} // namespace
