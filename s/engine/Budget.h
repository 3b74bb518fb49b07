// What a pool holds of the heap: its count, its peak, its limit; and the block of a pool. What that
// has beside the BucketMgr, whose layout is fixed, no request on the fast path touches.
// Test: tests/options_test.cpp.
#ifndef VOK_MEMPOOL_BUDGET_H
#define VOK_MEMPOOL_BUDGET_H

#include "MemPool"
#include "engine/BucketMgr.h"
#include "engine/Checks.h"
#include "services/Observers.h"
#include "services/Settings.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <string>

namespace VOK::MemPool {

struct Bucket;

/// Counts the blocks of buckets and ExtRecs, with their headers. The figures are there for another
/// process, too, which visits no bucket for them.
struct Budget {
  std::uint64_t held = 0;                       ///< bytes
  std::uint64_t peak = 0;                       ///< the most that it ever was
  std::uint64_t buckets = 0;                    ///< how many there are
  std::uint64_t reserved = 0;                   ///< bytes of blocks that are about to come
  std::uint64_t limit = UINT64_MAX;             ///< a request that would pass it fails
  decltype(Options::atLimit) atLimit = nullptr; ///< asked before such a request fails
  void* context = nullptr;                      ///< the last argument of atLimit
  const Bucket* newest = nullptr;               ///< the bucket made last, which may be gone
  std::unique_ptr<Checks> checks;               ///< of a checked pool; ends before the pool

  bool Admits(std::uint64_t bytes) const { return held + reserved + bytes <= limit; }

  /// Asks the program for room; throws std::bad_alloc unless it answers that there may be some, and
  /// for a block that fits into no room.
  void AskFor(std::uint64_t bytes, Mgr& mgr) const {
    if (bytes > limit || atLimit == nullptr ||
        !atLimit(mgr, static_cast<std::size_t>(bytes), context))
      throw std::bad_alloc();
  }

  /// The length of a damaged ExtRec may be more than all that is held.
  void Remove(std::uint64_t bytes) { held -= std::min(held, bytes); }

  /// Room for a block that is about to come from the heap, so that what a new-handler allocates
  /// meanwhile can't pass the limit.
  class Room {
  public:
    Room(Budget& budget_, std::uint64_t bytes_) : budget(budget_), bytes(bytes_) {
      budget.reserved += bytes;
    }
    ~Room() { budget.reserved -= bytes; }
    Room(const Room&) = delete;
    Room& operator=(const Room&) = delete;

    /// The block is there.
    void Fill() {
      budget.held += bytes;
      budget.peak = std::max(budget.peak, budget.held);
    }

  private:
    Budget& budget;
    const std::uint64_t bytes;
  };
};

/// The block that a pool lives in.
struct PoolBlock {
  BucketMgr pool;
  Budget budget;

  /// Where a memory-checking tool is present, that one checks.
  PoolBlock(Mgr* mgr, const std::string& name, const Options& options) : pool(mgr, name, options) {
    if (!pool.enabled || !options.checked.Or(Settings::checked) || Observers::Present()) return;
    pool.fastIndex = noFastIndex;
    budget.checks =
        std::make_unique<Checks>(pool, options.endsAtFinding.Or(Settings::endsAtFinding), options);
  }

  static PoolBlock& Of(BucketMgr& pool) { return reinterpret_cast<PoolBlock&>(pool); }
  static const PoolBlock& Of(const BucketMgr& pool) {
    return reinterpret_cast<const PoolBlock&>(pool);
  }
};

static_assert(offsetof(PoolBlock, pool) == 0);

inline Budget& BudgetOf(BucketMgr& pool) { return PoolBlock::Of(pool).budget; }
inline const Budget& BudgetOf(const BucketMgr& pool) { return PoolBlock::Of(pool).budget; }

/// Null for a pool that isn't checked.
inline Checks* ChecksOf(const BucketMgr& pool) { return BudgetOf(pool).checks.get(); }

} // namespace VOK::MemPool

#endif
