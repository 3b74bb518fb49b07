// Pools by thread: a random exchange of blocks between threads that begin and end, and what happens
// around the end of a thread and of the pools. The preset tsan runs this; VOK_MEMPOOL_STEPS in the
// environment sets the length of the exchange.
#include <MemPoolThreads>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <gtest/gtest.h>
#include <optional>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace VOK::MemPool;

struct Block {
  ThreadResource resource;
  std::size_t size;
  std::size_t alignment;
  unsigned char* p;

  Block(ThreadPools& pools, std::size_t size_, std::size_t alignment_)
      : resource(pools), size(size_), alignment(alignment_),
        p(static_cast<unsigned char*>(resource.allocate(size, alignment))) {
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(p) % alignment, 0U) << size << ' ' << alignment;
    std::fill_n(p, size, Pattern());
  }
  ~Block() {
    EXPECT_EQ(std::count(p, p + size, Pattern()), size) << alignment;
    resource.deallocate(p, size, alignment);
  }
  Block(const Block&) = delete;
  Block& operator=(const Block&) = delete;

  unsigned char Pattern() const { return static_cast<unsigned char>(size + alignment * 3); }
};

void InThread(const auto& work) { std::thread(work).join(); }

/// Expects at most `most` pools of the name, with nothing in use. With pooling off the leak check
/// of the address sanitizer says so.
void ExpectEmpty(ThreadPools& pools, const std::string& name, int most) {
  pools.Collect();
  int number = 1;
  while (const Mgr* const pool = GetMgr((name + '#' + std::to_string(number)).c_str())) {
    const Stats stats = pool->GetStats();
    EXPECT_EQ(stats.usedRecords + stats.largeRecords, 0U) << pool->GetName();
    ++number;
  }
  EXPECT_LE(number - 1, most);
}

/// Threads replace blocks of each other, with threads that begin and end in each of three lanes.
void Exchange(const Options& options, unsigned numSteps) {
  constexpr int numLanes = 3;
  ThreadPools one("one", options);
  ThreadPools two("two", Options().On());
  std::array<std::atomic<Block*>, 200> blocks{};
  const auto replaceSome = [&](unsigned seed, unsigned count) {
    std::mt19937 random(seed);
    for (unsigned i = 0; i < count; ++i) {
      ThreadPools& pools = random() % 8 == 0 ? two : one;
      auto* const block =
          new Block(pools, random() % 2001 >> random() % 9, std::size_t{1} << random() % 9);
      delete blocks[random() % blocks.size()].exchange(block);
    }
  };
  std::vector<std::thread> lanes;
  for (unsigned lane = 0; lane < numLanes; ++lane)
    lanes.emplace_back([&, lane] {
      constexpr unsigned perThread = 500;
      for (unsigned i = 0; i < numSteps / numLanes; i += perThread)
        InThread([&] { replaceSome(i + lane, perThread); });
    });
  for (std::thread& lane : lanes)
    lane.join();
  for (std::atomic<Block*>& block : blocks)
    delete block.load();
  ExpectEmpty(one, "one", numLanes);
  ExpectEmpty(two, "two", numLanes);
}

TEST(ThreadPools, ExchangeBlocks) {
  const char* const text = std::getenv("VOK_MEMPOOL_STEPS");
  const unsigned numSteps = text != nullptr        ? static_cast<unsigned>(std::atol(text))
                            : VOK_MEMPOOL_EMULATED ? 3000
                                                   : 30000;
  Exchange(Options().On(), numSteps);
  Exchange(Options().On(false), numSteps);
  Exchange(Options().On().MaxRecordSize(64).KeepEmptyBuckets(), numSteps);
  Exchange(Options().On().DataAlignment(1), numSteps);
  EXPECT_EQ(GetNumMgrs(), 0U);
}

TEST(ThreadPools, CostsWhatIsDocumented) {
  ThreadPools pools("cost", Options().On());
  const Block block(pools, 40, 8);
  EXPECT_EQ(GetMgr("cost#1")->GetStats().payload, sizeof(void*) == 8 ? 44U : 48U);
}

TEST(ThreadPools, ServeEverySizeAndAlignment) {
  for (const bool on : {true, false}) {
    ThreadPools pools("sizes", Options().On(on));
    for (std::size_t alignment = 1; alignment <= 256; alignment *= 2) {
      std::vector<std::unique_ptr<Block>> blocks;
      for (std::size_t size = 0; size <= 2000; size += VOK_MEMPOOL_EMULATED ? 7 : 1)
        blocks.push_back(std::make_unique<Block>(pools, size, alignment));
      if (alignment % 3 == 1) InThread([&] { blocks.clear(); });
    }
    ExpectEmpty(pools, "sizes", 1);
    const std::size_t most = std::numeric_limits<std::size_t>::max();
    for (const std::size_t size :
         {most, most - 7, std::size_t{maxRequest} + 1, std::size_t{maxRequest}})
      EXPECT_THROW(pools.Alloc(size), std::bad_alloc) << size;
    EXPECT_THROW(pools.Alloc(1, most / 2 + 1), std::bad_alloc);
    EXPECT_THROW(static_cast<void>(ThreadAllocator<long>(pools).allocate(most / 2)),
                 std::bad_array_new_length);
    pools.Free(nullptr);
    ExpectEmpty(pools, "sizes", 1);
  }
}

TEST(ThreadPools, AreHandedOn) {
  ThreadPools pools("handed on", Options().On().KeepEmptyBuckets());
  void* first = nullptr;
  void* second = nullptr;
  InThread([&] { first = pools.Alloc(20); });
  pools.Free(first); // waits, for the pool has no thread
  InThread([&] {
    second = pools.Alloc(20);
    EXPECT_EQ(second, first);
    InThread([&] { pools.Free(second); }); // takes no pool
    pools.Free(pools.Alloc(20));
  });
  ExpectEmpty(pools, "handed on", 1);
}

// A tool that watches takes the cache and the checks away.
bool IsWatched() { return Mgr().IsObserved(); }

TEST(ThreadPools, KeepBlocksForTheirOwner) {
  if (IsWatched()) return;
  ThreadPools pools("kept", Options().On());
  const Mgr& pool = *GetMgr("kept#1");
  std::vector<void*> blocks(3000);
  unsigned i = 0;
  std::generate(blocks.begin(), blocks.end(), [&] { return pools.Alloc(61 + i++ % 4, 8); });
  std::for_each(blocks.begin(), blocks.end(), [&](void* p) { pools.Free(p); });
  EXPECT_EQ(pool.GetStats().usedRecords, 512U); // 32 KiB of 64 bytes
  EXPECT_EQ(pools.Alloc(64, 8), blocks[511]);
  pools.Free(blocks[511]);
  EXPECT_NE(pools.Alloc(65, 8), blocks[511]);
  pools.Collect();
  EXPECT_EQ(pool.GetStats().usedRecords, 1U);
}

TEST(ThreadPools, HideNoFreeFromChecks) {
  if (IsWatched()) return;
  std::vector<Finding::Kind> kinds;
  const auto note = [](Mgr&, const Finding& finding, void* context) {
    static_cast<std::vector<Finding::Kind>*>(context)->push_back(finding.kind);
  };
  std::optional<ThreadPools> pools;
  pools.emplace("checked", Options().On().Checked().AtFinding(note, &kinds));
  auto* const block = static_cast<unsigned char*>(pools->Alloc(20));
  pools->Free(block);
  block[10] = 1;
  pools.reset();
  EXPECT_EQ(kinds, std::vector{Finding::Kind::WriteAfterFree});
}

TEST(ThreadPools, TakeBackBeforeAnAllocationFails) {
  ThreadPools pools("limited", Options().On().Limit(20000));
  for (const unsigned size : {100U, 3000U})
    for (int round = 0; round < 3; ++round) {
      std::vector<void*> blocks;
      EXPECT_THROW(for (;;) blocks.push_back(pools.Alloc(size)), std::bad_alloc);
      EXPECT_GE(blocks.size() * size, 12000U) << round;
      InThread(
          [&] { std::for_each(blocks.begin(), blocks.end(), [&](void* p) { pools.Free(p); }); });
    }
  ExpectEmpty(pools, "limited", 1);
}

TEST(ThreadPools, AreMadeAgainUnderTheThreadsThatUseThem) {
  std::optional<ThreadPools> pools;
  ThreadPools other("other", Options().On());
  for (int i = 0; i < 5; ++i) {
    pools.emplace("again", Options().On(i % 2 == 0));
    void* const block = pools->Alloc(i % 3 == 0 ? 10 : 5000);
    other.Free(other.Alloc(10));
    if (i % 2 == 0)
      pools->Free(block);
    else
      InThread([&] { pools->Free(block); }); // released by the end of the pools
    EXPECT_EQ(GetNumMgrs(), 2U);
  }
  InThread([&] {
    other.Free(other.Alloc(10));
    pools->Free(pools->Alloc(10));
    pools.reset(); // before the thread that uses them ends
  });
  EXPECT_EQ(GetNumMgrs(), 2U);
}

#ifndef _WIN32 // where a thread's own objects can't have a destructor
TEST(ThreadPools, ServeAThreadThatHasLeftItsPool) {
  ThreadPools pools("left", Options().On());
  struct Late {
    ThreadPools* pools = nullptr;
    void* block = nullptr;
    ~Late() {
      if (pools == nullptr) return;
      pools->Free(block);
      block = pools->Alloc(30);
      pools->Free(block);
    }
  };
  InThread([&] {
    static thread_local Late late; // made before the thread's pool, destroyed after it
    late.pools = &pools;
    late.block = pools.Alloc(30);
  });
  ExpectEmpty(pools, "left", 1);
}
#endif

TEST(ThreadPools, NeedTheirNames) {
  const Mgr mgr("taken#2", Options());
  ThreadPools pools("taken", Options().On());
  EXPECT_THROW(ThreadPools("taken"), std::invalid_argument);
  void* const block = pools.Alloc(10);
  InThread([&] {
    EXPECT_THROW(pools.Alloc(10), std::invalid_argument);
    pools.Free(block);
  });
  EXPECT_EQ(GetNumMgrs(), 2U);
}

} // namespace
