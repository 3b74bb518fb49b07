// What no call on an intact pool shows: damaged headers, foreign memory, and the walk of
// Invariants.
#include "support/Pools.h"

#include "engine/Bucket.h"
#include "engine/Budget.h"
#include "engine/ExtRec.h"
#include "engine/FastPath.h"
#include "engine/Group.h"
#include "engine/Invariants.h"

#ifdef __linux__
#include <sys/mman.h>
#endif

namespace {

using namespace VOK::MemPool;

TEST_F(Pools, DamagedHeaders) {
  Mgr& pool = Make("a", "bucket=50 max=16");
  std::uint8_t* const p = Alloc(pool, 12);
  Alloc(pool, 299);
  std::uint8_t* const e = Alloc(pool, 300);
  Alloc(pool, 301);
  Bucket& bucket = *Bucket::FromData(p);
  ExtRec& ext = *ExtRec::FromData(e);
  BucketMgr& own = *pool.GetBucketMgr(); // a checked handle would stop at the damage
  const auto expect = [&](std::uint8_t* data, auto& field, auto value, unsigned size,
                          int line = __builtin_LINE()) {
    const auto old = std::exchange(field, static_cast<std::decay_t<decltype(field)>>(value));
    EXPECT_EQ(Bucket::FromData(data), nullptr) << "line " << line;
    EXPECT_EQ(pool.GetSize(data), size) << "line " << line;
    EXPECT_EQ(pool.Contains(data), size != 0) << "line " << line;
    EXPECT_TRUE((size != 0 && size != 300) || !own.Free(data)) << "line " << line;
    field = old;
  };
  for (const int type : {0, 2, 3, 255})
    expect(p, p[-2], type, 0);
  for (const int offset : {0, 1})
    expect(p, p[-4], offset, 0);
  expect(p, bucket.recsSize, 0, 0);
  expect(p, bucket.parent, nullptr, 0);
  for (const int tag : {-4, -3, -2, -1})
    expect(e, e[tag], 77, 0);
  for (const unsigned length : {0u, 1u, 0x100u, 0x10000u, 0x1000000u})
    expect(e, ext.length, length, length);
  // An ExtRec that its neighbours on the list don't know.
  expect(e, ext.prev->next, nullptr, 300);
  expect(e, ext.next->prev, nullptr, 300);
  EXPECT_TRUE(pool.Free(e));
  bucket.recSize = bucket.recsSize = 0;
  EXPECT_TRUE(own.Reset() && own.Alloc(12) == p && own.Free(p));
  Bucket::Destroy(nullptr);
  Bucket scrubbed{};
  Bucket::Destroy(&scrubbed);
}

#ifdef __linux__
// A header in low memory that leads to a bucket at address 0.
TEST_F(Pools, BucketAtNull) {
  auto* const page = static_cast<std::uint8_t*>(
      mmap(reinterpret_cast<void*>(0x10000), 4096, PROT_READ | PROT_WRITE,
           MAP_PRIVATE | MAP_ANONYMOUS | MAP_FIXED_NOREPLACE, -1, 0));
  if (reinterpret_cast<std::uintptr_t>(page) != 0x10000) return; // not every system maps it
  Mgr& pool = Make("a");
  std::uint8_t* p = page + sizeof(Rec);
  for (std::size_t offset = 0x10000 - recsBaseOffset; offset < 0x10000; ++offset, ++p) {
    p[-4] = static_cast<std::uint8_t>(offset % 256);
    p[-3] = static_cast<std::uint8_t>(offset / 256);
    p[-2] = 1; // used
    EXPECT_TRUE(pool.GetSize(p) == 0 && !pool.Contains(p) && !pool.Free(p)) << offset;
  }
  Output output;
  ZOR_VOK_MEMPOOL_TRACE(true);
  EXPECT_FALSE(pool.Free(page + 8));
  EXPECT_THAT(output.Text(), testing::EndsWith(":10008:\n"));
  munmap(page, 4096);
}
#endif

// What a pool's own call never does: a lookup by the Group itself, and another Group's bucket.
TEST_F(Pools, GroupFree) {
  Mgr& pool = Make("a");
  std::uint8_t* const p = Alloc(pool, 4);
  std::uint8_t* const q = Alloc(pool, 8);
  Alloc(pool, 4);
  Group& group = *Bucket::FromData(p)->parent;
  EXPECT_FALSE(group.Free(nullptr, nullptr));
  EXPECT_FALSE(group.Free(Alloc(pool, 2000), nullptr)) << "no bucket has it";
  EXPECT_FALSE(group.Free(q, nullptr)) << "another Group's";
  EXPECT_FALSE(group.Free(nullptr, group.head1));
  EXPECT_FALSE(group.Free(reinterpret_cast<void*>(4), group.head1)) << "a header at null";
  EXPECT_TRUE(pool.Contains(q) && group.Free(p, nullptr));
  EXPECT_FALSE(group.Free(p, nullptr)) << "free already";
}

// The pool's table ends before the class of the record, though the memory after it names its Group.
TEST_F(Pools, ClassBeyondTheTable) {
  Mgr& other = Make("a", "max=1000");
  std::uint8_t* const p = Alloc(other, 900);
  Mgr& pool = Make("b", "max=8");
  std::uint8_t* const after = Alloc(other, 5000);
  for (std::size_t i = 0; i < 5000 / sizeof(void*); ++i)
    std::memcpy(after + i * sizeof(void*), &Bucket::FromData(p)->parent, sizeof(void*));
  EXPECT_TRUE(pool.GetSize(p) == 0 && !pool.Contains(p) && !pool.Free(p));

  // A new bucket, before a Group links it.
  const ArenaHeap::Use use;
  Bucket* const b = Bucket::Create(Bucket::FromData(p)->parent, 50, 12);
  EXPECT_EQ(b->parent, Bucket::FromData(p)->parent);
  EXPECT_TRUE(!b->next1 && !b->prev1 && !b->next2 && !b->prev2);
  Bucket::Destroy(b);
}

// A heap's size field before a block can read as a used record's header, and lead to a bucket in
// no memory at all: a disabled pool reads no header. The first block is at the arena's start.
TEST_F(Pools, DisabledBlocksOfAnySize) {
  Mgr pool;
  for (const bool arena : {true, false})
    for (unsigned size = 0x1FFFF; size<400000; size -= size> 3000 ? 499 : 1) {
      const ArenaHeap::Use use(arena);
      void* const p = pool.Alloc(size);
      const bool isUnknown = pool.GetBucketMgr()->FindBucket(p) == nullptr &&
                             pool.GetSize(p) == 0 && !pool.Contains(p) && pool.Free(p);
      const ArenaHeap::Use real(false);
      EXPECT_TRUE(isUnknown) << "size " << size << (arena ? " in the arena" : "");
    }
}

TEST_F(Pools, IsValidFindsEachDamage) {
  Mgr& mgr = Make("a", "bucket=26 max=16 keep=1");
  const std::vector<std::uint8_t*> p = Alloc(mgr, 9, 4);
  std::memset(p[4], 0, 4); // reads as the header of a free record, and is none
  for (const unsigned i : {4u, 6u, 7u, 8u})
    mgr.Free(p[i]);
  Alloc(mgr, 100);
  ExtRec& last = *ExtRec::FromData(Alloc(mgr, 100))->next;
  BucketMgr& pool = *mgr.GetBucketMgr();
  Group& group = *pool.groups[0];
  Bucket& empty = *group.head1;
  Bucket& partly = *empty.next1;
  Bucket& full = *partly.next1;
  const auto damage =
      [&pool]<class Field>(Field& field, std::initializer_list<std::type_identity_t<Field>> values,
                           int line = __builtin_LINE()) {
        const Field old = field;
        for (const Field value : values) {
          field = value;
          EXPECT_TRUE(value == old || !IsValid(pool)) << "line " << line << ", value " << value;
        }
        field = old;
      };
  // From the first field to the last byte, each of which can have any wrong value.
  const std::pair<void*, std::size_t> bytes[] = {
      {p[3] - 4, 3},       {p[4] - 4, 3},        {&last.tag0, 4},        {&partly.recsSize, 8},
      {&full.freeHead, 2}, {&pool.numGroups, 8}, {&group.numBuckets, 8}, {&pool.maxRecSize, 8}};
  for (const auto& [first, size] : bytes)
    for (std::size_t i = 0; i < size; ++i)
      for (int value = 0; value < 256; ++value)
        damage(static_cast<std::uint8_t*>(first)[i], {static_cast<std::uint8_t>(value)});
  for (Bucket** link : {&partly.prev1, &partly.next1, &partly.prev2, &partly.next2, &empty.prev2,
                        &group.head2, &group.tail1})
    damage(*link, {&full, &partly});
  damage(pool.bucketSize, {19, 25});
  damage(partly.parent, {&group + 1});
  damage(const_cast<BucketMgr*&>(group.owner), {nullptr});
  damage(pool.groups[1], {&group});
  damage(pool.enabled, {false});
  damage(last.prev, {nullptr});
  damage(BudgetOf(pool).buckets, {2, 4});
  damage(BudgetOf(pool).held, {0});
  group.numFreeBuckets = 1;
  damage(empty.next2, {nullptr});
  group.numFreeBuckets = 2;
  EXPECT_TRUE(IsValid(pool));
}

// A second destruction of a handle does nothing, and its pool's pointers are null.
TEST_F(Pools, DestroyedTwice) {
  alignas(Mgr) unsigned char place[sizeof(Mgr)];
  Make("a"); // so that the registry has something to compare
  const ArenaHeap::Use use;
  auto* const mgr = new (place) Mgr("twice");
  mgr->~Mgr();
  const ArenaHeap::Use real(false);
  EXPECT_EQ(mgr->GetBucketMgr(), nullptr);
  mgr->~Mgr();
  for (const ArenaHeap::Event& event : heap.events)
    EXPECT_TRUE(event.kind != '-' || event.size != sizeof(PoolBlock) ||
                std::count(&event.bytes[offsetof(BucketMgr, groups)],
                           &event.bytes[offsetof(BucketMgr, bucketSize)],
                           0) == 2 * sizeof(void*) + 8);
}

} // namespace
