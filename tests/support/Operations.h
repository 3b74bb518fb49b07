// Bytes become calls on a few pools at settings of all kinds, and each is compared with the
// reference: its result, what it does to the heap and writes, every byte of the pool's state.
#ifndef VOK_MEMPOOL_TESTS_OPERATIONS_H
#define VOK_MEMPOOL_TESTS_OPERATIONS_H

#include "support/Reference.h"

#include "engine/BucketMgr.h"
#include "engine/Invariants.h"
#include "services/Observers.h"

#include <optional>

class Operations {
public:
  unsigned numCalls = 0;

  /// `next` gives a byte, or a negative number at the end of the input.
  Operations(ArenaHeap& heap_, std::function<int()> next_) : heap(heap_), next(std::move(next_)) {}

  /// Throws std::logic_error at the first difference; the state is compared at each `interval`.
  void Run(unsigned interval = 1) {
    for (int op = next(); op >= 0; op = next()) {
      Pool& pool = pools[op % 4];
      Step(pool, op / 4);
      if (++numCalls % interval == 0) Compare(pool);
    }
    heap.FailAt(0);
    for (Pool& pool : pools)
      if (pool.mgr) Compare(pool), Destroy(pool);
    Demand(heap.Finish().empty(), "blocks are left");
  }

private:
  struct Pool {
    std::optional<VOK::MemPool::Mgr> mgr;
    std::optional<Reference> reference;
    std::vector<std::pair<std::uint8_t*, std::uint32_t>> live; // with the sizes asked for
  };

  template <class Call>
  static auto Try(const Call& call) -> std::optional<decltype(call())> {
    try {
      return call();
    } catch (const std::bad_alloc&) {
      return std::nullopt;
    }
  }
  /// The result, nothing if memory runs out.
  template <class Call, class Prediction>
  auto Both(const Call& call, const Prediction& prediction) {
    const auto result = Try([&] {
      const ArenaHeap::Use use;
      return call();
    });
    Demand(result == Try(prediction), "another result");
    log.End();
    return result;
  }

  void Step(Pool& pool, int kind) {
    if (!pool.mgr) return Make(pool);
    if (kind > 32) return Alloc(pool);
    if (kind > 7) return Free(pool, Byte());
    if (kind > 3) return Ask(pool, pools[Byte() % 4]);
    if (kind == 3) return heap.FailAt(1 + Byte() % 3);
    if (kind == 2) return VOK::MemPool::ZOR_VOK_MEMPOOL_TRACE(Byte() % 4 == 0);
    if (kind == 1) return Demand(!pool.mgr->CollectGarbage(), "CollectGarbage");
    const unsigned rare = Byte();
    if (rare < 16) Destroy(pool);
    if (rare >= 16 && rare < 32) Clear(pool);
    if (rare >= 32 && rare < 64) Reset(pool);
  }

  void Make(Pool& pool) {
    using namespace VOK::MemPool;
    constexpr std::uint32_t large[] = {65535, 65536, 0xFFFFFFFF, 4010};
    constexpr std::uint32_t alignments[] = {4,  1,  2, 3,       4, 5,  8,   12,
                                            16, 32, 0, 0x10008, 4, 64, 100, 4};
    const std::uint32_t word = Word();
    const std::uint32_t bucketSize = word < 0xF800 ? 12 + word % 800 : large[word % 4];
    const std::uint32_t alignment = alignments[Byte() % 16];
    const std::uint32_t max = Word() % std::min(bucketSize, 65536u);
    const std::uint32_t min = Byte() % 80;
    const std::uint32_t flags = Byte();
    const Reference::Settings given{bucketSize, alignment,      max,
                                    min,        flags % 2 != 0, flags % 16 > 1};
    if (!given.IsPossible()) return;
    ZOR_VOK_MEMPOOL_BUCKET_SIZE(bucketSize);
    ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(alignment);
    ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(max);
    ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(min);
    ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(given.keepEmptyBuckets);
    word % 2 == 0 ? ZOR_VOK_MEMPOOL_ON(given.on) : ZOR_VOK_MEMPOOL_OFF(!given.on);
    Demand(ZOR_VOK_MEMPOOL_BUCKET_SIZE() == bucketSize &&
               ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE() == max &&
               ZOR_VOK_MEMPOOL_DATA_ALIGNMENT() == alignment % 65536 &&
               ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE() == min &&
               ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS() == given.keepEmptyBuckets &&
               ZOR_VOK_MEMPOOL_ON() == given.on && ZOR_VOK_MEMPOOL_OFF() != given.on,
           "settings");
    const std::string name(1, static_cast<char>('a' + (&pool - pools)));
    Both([&] { return pool.mgr.emplace(name.c_str()).IsEnabled(); },
         [&] {
           return pool.reference.emplace(log, given, pool.mgr ? &*pool.mgr : nullptr).settings.on;
         });
  }
  void Destroy(Pool& pool) {
    while (!pool.reference->settings.on && !pool.live.empty())
      Free(pool, 0);
    Both([&] { return pool.mgr.reset(), 0; }, [&] { return pool.reference->Destroy(), 0; });
    pool.live.clear();
  }
  void Clear(Pool& pool) {
    Both([&] { return pool.mgr->Clear(), 0; }, [&] { return pool.reference->Clear(), 0; });
    if (pool.reference->settings.on) pool.live.clear();
  }
  void Reset(Pool& pool) {
    if (Both([&] { return pool.mgr->Reset(); }, [&] { return pool.reference->Reset(); }) == true)
      pool.live.clear();
  }
  void Alloc(Pool& pool) {
    const std::uint32_t byte = Byte();
    const std::uint32_t size = byte < 128   ? byte % 64
                               : byte < 250 ? byte
                               : byte < 255 ? Word()
                                            : 0x3FFFFFFF;
    const auto p = Both([&] { return static_cast<std::uint8_t*>(pool.mgr->Alloc(size)); },
                        [&] { return pool.reference->Alloc(size); });
    if (!p) return;
    const auto pattern = static_cast<std::uint8_t>(0x40 | numCalls);
    const auto image = std::prev(pool.reference->blocks.upper_bound(*p));
    std::memset(*p, pattern, size);
    std::fill_n(image->second.begin() + (*p - image->first), size, pattern);
    pool.live.emplace_back(*p, size);
  }
  // And once more, which has a known result while the bucket exists.
  void Free(Pool& pool, unsigned index) {
    if (pool.live.empty()) return;
    std::uint8_t* const p =
        std::exchange(pool.live[index % pool.live.size()], pool.live.back()).first;
    pool.live.pop_back();
    FreeBoth(pool, p);
    if (pool.reference->Around(p) != nullptr) FreeBoth(pool, p);
  }
  void FreeBoth(Pool& pool, std::uint8_t* p) {
    Both([&] { return pool.mgr->Free(p); }, [&] { return pool.reference->Free(p); });
  }
  // Of a block of this pool or another, or of a place within.
  void Ask(Pool& pool, Pool& other) {
    if (other.live.empty()) return;
    auto [p, size] = other.live[Byte() % other.live.size()];
    const unsigned shift = Byte();
    if (shift > 127 && size > 4) p += 4 + shift % (size - 3);
    std::uint32_t expected = pool.reference->RecordSize(p);
    for (Pool& each : pools)
      if (each.mgr) expected = std::max(expected, each.reference->ExtSize(p));
    Demand(pool.mgr->GetSize(p) == expected, "GetSize");
    Demand(pool.mgr->Contains(p) == (expected != 0), "Contains");
    // The pool can't distinguish an ExtRec within another list from its own.
    const bool isUnknown = other.reference->ExtSize(p) > 0 && !other.reference->IsFirstExt(p) &&
                           !pool.reference->exts.empty();
    if (&pool != &other && pool.reference->settings.on && !isUnknown) FreeBoth(pool, p);
    FreeBoth(pool, nullptr);
  }

  // Byte by byte, since the address sanitizer would report memcmp on free records.
  __attribute__((no_sanitize_address)) static void Compare(Pool& pool) {
    if (!pool.mgr) return;
    const VOK::MemPool::BucketMgr& real = *pool.mgr->GetBucketMgr();
    Demand(IsValid(real), "not valid");
    Demand(real.GetNumBuckets() == pool.reference->NumBuckets(), "GetNumBuckets");
    pool.reference->Refresh();
    for (const auto& [at, image] : pool.reference->blocks)
      for (std::size_t i = 0; i < image.size(); ++i)
        if (at[i] != image[i]) Demand(false, "other bytes");
  }

  unsigned Byte() { return static_cast<unsigned>(std::max(next(), 0)); }
  unsigned Word() {
    const unsigned high = Byte();
    return high * 256 + Byte();
  }

  ArenaHeap& heap;
  const std::function<int()> next;
  Log log{heap};
  const KeepSettings settings{};
  const VOK::MemPool::Observers::Quiet looking;
  Pool pools[4];
};

#endif
