#include "support/Script.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"

#include <algorithm>
#include <cstring>
#include <gtest/gtest.h>
#include <iostream>
#include <memory>

using namespace VOK::MemPool;

namespace {

TEST(BucketMgr, Requests) {
  Expect(R"(
set on=1; pool a; enabled a -> true; heap; alloc a x0 0 -> #1+2 : +Group +[<4036|4056>]
alloc a x1 1 -> #1+10; alloc a x5 5 -> #2+2 : +Group +[<4036|4056>]
alloc a x10 10 -> #3+2 : +Group +[<4028|4048>]; alloc a x996 996 -> #4+2 : +Group +[<4028|4048>]
alloc a x997 997 -> ext : +[<1013|1021>]; alloc a x2000 2000 -> ext : +[<2016|2024>]
size a x0 -> 4; size a x1 -> 4; size a x5 -> 8; size a x10 -> 12; size a x996 -> 996
size a x997 -> 997; size a x2000 -> 2000; free a x997 -> true : -[<1013|1021>]
free a x996 -> true : -[<4028|4048>]
alloc a max 0x3FFFFFFF -> bad_alloc : ![<1073741839|1073741847>]
clear a : -[<2016|2024>] -[<4036|4056>] -Group -[<4036|4056>] -Group -[<4028|4048>] -Group -Group
show a -> nothing; alloc a x10 10 -> #5+2 : +Group +[<4028|4048>]
drop a : -std -[<4028|4048>] -Group -[<996|1992>] -BucketMgr -Mgr
)");
}

// Four kinds of pool for each kind of pointer: records of b and c are a's foreign ones.
TEST(BucketMgr, WhatEachPointerGets) {
  Expect(R"(
set on=1 bucket=104 max=96; pool a; pool b; set align=8 min=24; pool c; alloc a used 10 -> #1+2
alloc a keeps 10 -> #1+18; alloc b other_pool 10 -> #2+2; alloc b keeps 10 -> #2+18
alloc c other_kind 10 -> #3+2; alloc a ext 500 -> ext; alloc b other_ext 500 -> ext
alloc a large 50 -> #4+2; alloc a gone 10 -> #1+34; free a gone -> true
# pointer by pointer: size, has, free
size a null -> 0; has a null -> false; free a null -> false; size a other -> 0
has a other -> false; free a other -> false; size a used+8 -> 0; has a used+8 -> false
free a used+8 -> false; size a gone -> 0; has a gone -> false; free a gone -> false
size a other_pool -> 0; has a other_pool -> false; free a other_pool -> false
size a other_kind -> 0; has a other_kind -> false; free a other_kind -> false; size c used -> 0
has c used -> false; free c used -> false; size c large -> 0; has c large -> false
free c large -> false; size a other_ext -> 500; has a other_ext -> true; free a other_ext -> false
show b -> [2] 12: #2(34 50 66 82) free #2 tail #2, ext 500; size a ext -> 500; has a ext -> true
free a ext -> true; size a used -> 12; has a used -> true; free a used -> true
free b other_ext -> true; free b other_pool -> true; free c other_kind -> true
show a -> [2] 12: #1(2 34 50 66 82) free #1 tail #1, [12] 52: #4() free tail #4
show b -> [2] 12: #2(2 34 50 66 82) free #2 tail #2
)");
}

TEST(BucketMgr, WhatEachPointerGetsOfADisabledPool) {
  Expect(R"(
set on=1; pool on; alloc on used 10 -> #1+2; alloc on ext 2000 -> ext; set on=0; pool a
enabled a -> false; heap; alloc a zero 0 -> heap : +[0]; alloc a x 10 -> heap : +[10]
alloc a y 5000 -> heap : +[5000]
alloc a z 66000 -> heap : +[66000]; show a -> nothing; size a null -> 0; has a null -> false
free a null -> false; size a x -> 0; has a x -> false; size a y -> 0; has a y -> false
size a z -> 0; has a z -> false; size a used -> 0; has a used -> false
# the ExtRec test has no owner to ask
size a ext -> 2000; has a ext -> true; clear a; free a x -> true : -[10]
free a y -> true : -[5000]; free a z -> true : -[66000]; free a zero -> true : -[0]
alloc a x 0x3FFFFFFF -> bad_alloc : ![1073741823]; drop a : -std -[<996|1992>] -BucketMgr -Mgr
)");
}

// The foreign head, the foreign middle and the foreign last of other pools' lists.
TEST(BucketMgr, ExtRecs) {
  Expect(R"(
set on=1; pool a; pool b; alloc b b1 1001 -> ext; alloc b b2 1002 -> ext; alloc b b3 1003 -> ext
free a b1 -> false; free a b3 -> false; alloc a a1 2001 -> ext; alloc a a2 2002 -> ext
alloc a a3 2003 -> ext; show a -> ext 2003 2002 2001; free a b3 -> false
show b -> ext 1003 1002 1001; heap; free a a2 -> true : -[<2018|2026>]; show a -> ext 2003 2001
free a a3 -> true : -[<2019|2027>]; show a -> ext 2001; free a a1 -> true : -[<2017|2025>]
show a -> nothing; free b b1 -> true : -[<1017|1025>]; show b -> ext 1003 1002
drop b : -std -[<1019|1027>] -[<1018|1026>] -[<996|1992>] -BucketMgr -Mgr
)");
}

// With dataAlignment + 4 above maxRecSize every request becomes an ExtRec.
TEST(BucketMgr, ExtRecOfLength0StaysUntilClear) {
  Expect(R"(
set on=1 align=8 max=8 min=8; pool a; alloc a x 0 -> ext; alloc a y 1 -> ext; alloc a z 0 -> ext
show a -> ext 0 1 0; size a x -> 0; has a x -> false; free a x -> false; free a y -> true
show a -> ext 0 0; heap; clear a : -[<16|24>] -[<16|24>]; show a -> nothing
)");
}

// Which size fits the class of an index that several sizes share, and where it ends.
TEST(BucketMgr, LiftedSizesShareIndex0) {
  Expect(R"(
set on=1 min=40 max=60 bucket=100; pool a; alloc a p 1 -> #1+2; size a p -> 36
alloc a q 36 -> #1+42; size a q -> 36; alloc a r 37 -> #2+2; size a r -> 40; alloc a s 56 -> #3+2
alloc a t 57 -> ext
show a -> [0] 36: #1() free tail #1, [1] 40: #2(46) free #2 tail #2, [5] 56: #3() free tail #3, ext 57
set min=21 max=30 align=8; pool b; alloc b p 3 -> #4+2; size b p -> 16; alloc b q 24 -> ext
alloc b r 25 -> ext; show b -> [0] 16: #4(22 42 62) free #4 tail #4, ext 25 24
set align=3 min=5 max=20 bucket=24; pool c; alloc c p 1 -> #5+2; alloc c q 4 -> #6+2
size c q -> 6; alloc c r 14 -> ext; size c r -> 14; alloc c s 15 -> ext
show c -> [0] 3: #5(9 16) free #5 tail #5, [1] 6: #6(12) free #6 tail #6, ext 15 14
free c r -> true; show c -> [0] 3: #5(9 16) free #5 tail #5, [1] 6: #6(12) free #6 tail #6, ext 15
)");
}

// Each setting of a pool is a copy: nothing that comes later changes it.
TEST(BucketMgr, Snapshot) {
  const struct {
    const char* settings;
    unsigned bucketSize, dataAlignment, maxRecSize, minRecSize, numGroups;
  } cases[] = {{"", 4010, 4, 1000, 8, 249},
               {"max=1001", 4010, 4, 1000, 8, 249},
               {"max=1003 min=9", 4010, 4, 1000, 12, 248},
               {"min=0", 4010, 4, 1000, 4, 250},
               {"min=1000", 4010, 4, 1000, 1000, 1},
               {"max=8", 4010, 4, 8, 8, 1},
               {"align=1 max=4006", 4010, 1, 4006, 8, 3999},
               {"align=0", 4010, 1, 1000, 8, 993},
               {"align=0x10000", 4010, 1, 1000, 8, 993},
               {"align=0x10008", 4010, 8, 1000, 8, 125},
               {"align=7 max=65531 bucket=0xFFFFFFFF min=1", 65535, 7, 65527, 7, 9361},
               {"bucket=65536 max=65531", 65535, 4, 65528, 8, 16381},
               {"bucket=65535 max=65531 align=1 min=65531", 65535, 1, 65531, 65531, 1},
               {"bucket=12 max=8 keep=1", 12, 4, 8, 8, 1}};
  for (const auto& c : cases)
    for (const bool on : {true, false}) {
      Script script;
      const bool keep = std::strstr(c.settings, "keep") != nullptr;
      script.Run(std::string("set ") + c.settings + (on ? " on=1" : " on=0") + "\npool a\n");
      script.Run(std::string("set bucket=1 align=2 max=3 min=4 on=") + (on ? "0" : "1") +
                 " keep=" + (keep ? "0" : "1"));
      const BucketMgr& pool = *script.Pool("a").GetBucketMgr();
      const testing::ScopedTrace row(__FILE__, __LINE__, c.settings);
      EXPECT_EQ(pool.bucketSize, c.bucketSize);
      EXPECT_EQ(pool.dataAlignment, c.dataAlignment);
      EXPECT_EQ(pool.maxRecSize, c.maxRecSize);
      EXPECT_EQ(pool.minRecSize, c.minRecSize);
      EXPECT_EQ(pool.numGroups, c.numGroups);
      EXPECT_EQ(pool.keepEmptyBuckets, keep);
      EXPECT_EQ(pool.enabled, on);
      EXPECT_EQ(pool.name, "a");
      EXPECT_EQ(pool.mgr, &script.Pool("a"));
      EXPECT_TRUE(std::all_of(pool.groups, pool.groups + pool.numGroups,
                              [](const Group* g) { return g == nullptr; }));
      EXPECT_TRUE(pool.extRecs == nullptr && pool.numExtRecs == 0 && pool.GetNumBuckets() == 0);
    }
}

// The two stops, for disabled pools too; the first test comes first.
TEST(BucketMgrDeathTest, ImpossibleSettings) {
  const char* const record = "the maximum record size is larger than the bucket size ";
  const char* const range = "the min rec size is larger than the max rec size ";
  const struct {
    const char *settings, *text, *numbers;
  } cases[] = {{"max=5000", record, R"(\(5000>4006\) \[4010\])"},
               {"align=1 max=4007", record, R"(\(4007>4006\) \[4010\])"},
               {"bucket=1003", record, R"(\(1000>999\) \[1003\])"},
               {"bucket=0", record, R"(\(1000>4294967292\) \[0\])"},
               {"bucket=3 max=0", record, R"(\(0>4294967295\) \[3\])"},
               {"bucket=100000 max=65532", record, R"(\(65532>65531\) \[65535\])"},
               {"max=0xFFFFFFFF", record, R"(\(4294967292>4006\) \[4010\])"},
               {"min=0xFFFFFFFF max=5000", record, R"(\(5000>4006\) \[4010\])"},
               {"min=0xFFFFFFFF", range, R"(\(4294967296>1000\))"},
               {"min=997 max=999", range, R"(\(1000>996\))"},
               {"max=3", range, R"(\(8>0\))"}};
  for (const auto& c : cases)
    for (const char* on : {" on=1", " on=0"})
      EXPECT_EXIT(
          {
            Set(std::string(c.settings) + on + " trace=1");
            std::cout.rdbuf(std::cerr.rdbuf());
            const Mgr pool("a");
          },
          testing::ExitedWithCode(1),
          std::string("^zvpt:c:\\w+\nERROR:../s/MemPool:  ...: ") +
              "Unexpected condition: " + c.text + c.numbers + "\n$")
          << c.settings << on;
}

TEST(BucketMgrDeathTest, TooLarge) {
  for (const bool on : {true, false})
    EXPECT_EXIT(
        {
          Set(on ? "on=1" : "on=0");
          Mgr pool("a");
          Set("trace=1");
          std::cout.rdbuf(std::cerr.rdbuf());
          pool.Alloc(0x40000000);
        },
        testing::ExitedWithCode(1),
        "^ERROR:../s/MemPool:  ...: Cannot allocate 1073741824 bytes, the maximum is "
        "1073741823\n$");
}

// The steps of a pool's making, each of which can run out of memory: the handle's own, the text
// of its name, the pool, its copy of the name, its table, the registry's entry and that one's key.
// A pool that has told of its making tells of its end if it was one.
TEST(BucketMgr, OutOfMemoryInTheConstructor) {
  Expect(R"(
set on=1 trace=1; heap
fail 1; pool a a_name_beyond_sso -> bad_alloc : !Mgr
fail 2; pool a a_name_beyond_sso -> bad_alloc : +Mgr !std -Mgr
fail 3; pool a a_name_beyond_sso -> bad_alloc : +Mgr +std !BucketMgr -std -Mgr
fail 4; pool a a_name_beyond_sso -> bad_alloc : +Mgr +std +BucketMgr !std -BucketMgr -std -Mgr
fail 5; pool a a_name_beyond_sso -> bad_alloc : +Mgr +std +BucketMgr +std | ![<996|1992>] -std -BucketMgr -std -Mgr
  |zvpt:c:{?}
fail 6; pool a a_name_beyond_sso -> bad_alloc : +Mgr +std +BucketMgr +std | +[<996|1992>] !std | -[<996|1992>] -std -BucketMgr -std -Mgr
  |zvpt:c:{?}
  |zvpt:d:{?}
fail 7; pool a a_name_beyond_sso -> bad_alloc : +Mgr +std +BucketMgr +std | +[<996|1992>] +std !std -std | -[<996|1992>] -std -BucketMgr -std -Mgr
  |zvpt:c:{?}
  |zvpt:d:{?}
heap; mgrs -> 0; heap
pool a a_name_beyond_sso : +Mgr +std +BucketMgr +std | +[<996|1992>] +std +std -std
  |zvpt:c:{a}
drop a : -std -std | -[<996|1992>] -std -BucketMgr -Mgr
  |zvpt:d:{a}
)");
}

// What the headers read at their release: an ExtRec's is zeroed by Free alone, a bucket's by all.
TEST(BucketMgr, ScrubbedHeaders) {
  const struct {
    const char* end;
    std::vector<std::string> wanted;
  } cases[] = {{"free a e\nfree a p", {"zeroed ext", "zeroed bucket"}},
               {"clear a", {"ext", "zeroed bucket"}},
               {"drop a", {"ext", "zeroed bucket"}}};
  for (const auto& c : cases) {
    Script script;
    script.Run("set on=1\npool a\nalloc a e 2000\nalloc a p 10");
    std::vector<std::string> seen;
    script.heap.watch = [&](const ArenaHeap::Event& event) {
      const bool isExt = event.size == sizeof(ExtRec) + 2000;
      if (!isExt && event.size != recsBaseOffset + 4002) return;
      const auto* const bytes = static_cast<const std::uint8_t*>(event.block);
      const std::size_t header = isExt ? sizeof(ExtRec) : 5 * sizeof(void*) + 4;
      const bool zeroed = std::all_of(bytes, bytes + header, [](auto byte) { return byte == 0; });
      seen.push_back(std::string(zeroed ? "zeroed " : "") + (isExt ? "ext" : "bucket"));
    };
    script.Run(c.end);
    EXPECT_EQ(seen, c.wanted) << c.end;
    EXPECT_EQ(script.Finish(), "");
  }
}

// A heap's size field in front of a block can read as a used record's header, and its bucket's as
// that of no memory at all: a disabled pool looks at none. First of all such a block at the arena's
// very start, then blocks of the arena and of the real heap.
TEST(BucketMgr, DisabledBlocksOfAnySize) {
  Script script;
  EXPECT_EQ(script.Run("set on=0; pool a; alloc a z 0x1FFFF; has a z; size a z; free a z"),
            "set on=0; pool a; alloc a z 0x1FFFF -> heap; has a z -> false; size a z -> 0; "
            "free a z -> true\n");
  script.Run("set on=1; pool b; alloc b p 10");
  Mgr& pool = script.Pool("a");
  for (const bool arena : {true, false})
    for (unsigned size = 0; size <= 200000; size += size < 3000 ? 1 : 499) {
      const ArenaHeap::Use use(arena);
      void* const p = pool.Alloc(size);
      if (pool.GetBucketMgr()->FindBucket(p) != nullptr || pool.GetSize(p) != 0 ||
          pool.Contains(p) || !pool.Free(p)) {
        const ArenaHeap::Use real(false);
        ADD_FAILURE() << "size " << size << (arena ? " in the arena" : "");
      }
    }
  EXPECT_EQ(pool.GetSize(script.Pointer("p")), 0u);
  EXPECT_EQ(script.Finish(), "");
}

} // namespace
