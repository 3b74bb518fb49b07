// The pools of a test, on an arena that must be in order when the test ends.
#ifndef VOK_MEMPOOL_TESTS_POOLS_H
#define VOK_MEMPOOL_TESTS_POOLS_H

#include "support/ArenaHeap.h"
#include "support/Process.h"

#include "engine/BucketMgr.h"
#include "services/Observers.h"

#include <gmock/gmock.h>

class Pools : public testing::Test {
protected:
  using Mgr = VOK::MemPool::Mgr;

  ArenaHeap heap;
  const KeepSettings settings{};
  const VOK::MemPool::Observers::Quiet looking; // into headers and free records
  std::vector<std::unique_ptr<Mgr>> pools;

  ~Pools() override {
    pools.clear();
    EXPECT_THAT(heap.Finish(), testing::IsEmpty());
  }
  /// With these settings and otherwise the default ones, switched on.
  Mgr& Make(const std::string& name, const std::string& set = "") {
    Set(KeepSettings::defaults + ("on=1 " + set));
    auto& pool = pools.emplace_back();
    const ArenaHeap::Use use;
    return *(pool = std::make_unique<Mgr>(name.c_str()));
  }
  static std::uint8_t* Alloc(Mgr& pool, unsigned size) {
    const ArenaHeap::Use use;
    return static_cast<std::uint8_t*>(std::memset(pool.Alloc(size), 0x5A, size));
  }
  static std::vector<std::uint8_t*> Alloc(Mgr& pool, unsigned number, unsigned size) {
    std::vector<std::uint8_t*> blocks(number);
    std::ranges::generate(blocks, [&] { return Alloc(pool, size); });
    return blocks;
  }
};

#endif
