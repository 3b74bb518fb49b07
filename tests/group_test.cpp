#include "support/Script.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Group.h"
#include "services/Observers.h"

#include <gtest/gtest.h>

using namespace VOK::MemPool;

namespace {

// The buckets hold three records of 8 bytes, at the offsets 2, 10 and 18.
TEST(Group, EmptiedBucketsGo) {
  Expect(R"(
set on=1 bucket=26 max=8 min=8; pool a; heap; alloc a p1 4 -> #1+2 : +Group +[<52|72>]
show a -> [0] 4: #1(10 18) free #1 tail #1; alloc a q1 4 -> #1+10
show a -> [0] 4: #1(18) free #1 tail #1; alloc a r1 4 -> #1+18; show a -> [0] 4: #1() free tail #1
# none is free: a second bucket goes to the head of both lists
alloc a p2 4 -> #2+2 : +[<52|72>]; show a -> [0] 4: #2(10 18) #1() free #2 tail #1
# a full bucket that gets one back serves next, with that very record
free a q1 -> true; show a -> [0] 4: #2(10 18) #1(10) free #1 #2 tail #1; alloc a q1 4 -> #1+10
# one on the list keeps its place
free a q1 -> true; alloc a q2 4 -> #1+10; free a p2 -> true : -[<52|72>]; free a p1 -> true
show a -> [0] 4: #1(2) free #1 tail #1; free a p1 -> false; alloc a p1 4 -> #1+2
alloc a q1 4 -> #3+2 : +[<52|72>]; alloc a p2 4 -> #3+10; alloc a r2 4 -> #3+18
alloc a p3 4 -> #4+2 : +[<52|72>]; alloc a q3 4 -> #4+10; alloc a r3 4 -> #4+18
show a -> [0] 4: #4() #3() #1() free tail #1
# from full: lists in opposite orders, then the middle of both goes
free a p3 -> true; free a p2 -> true; free a p1 -> true
show a -> [0] 4: #4(2) #3(10) #1(2) free #1 #3 #4 tail #1; free a q1 -> true
free a r2 -> true : -[<52|72>]; show a -> [0] 4: #4(2) #1(2) free #1 #4 tail #1
# the tail, then the last of all
free a q2 -> true; free a r1 -> true : -[<52|72>]; show a -> [0] 4: #4(2) free #4 tail #4
free a q3 -> true; free a r3 -> true : -[<52|72>]; show a -> [0] 4: free tail -
alloc a p 4 -> #5+2 : +[<52|72>]
)");
}

TEST(Group, EmptiedBucketsAreKept) {
  Expect(R"(
set on=1 bucket=26 max=8 min=8 keep=1; pool a; alloc a p1 4 -> #1+2; alloc a q1 4 -> #1+10
alloc a r1 4 -> #1+18; alloc a p2 4 -> #2+2; free a q1 -> true; free a p1 -> true
free a r1 -> true; show a -> [0] 4: #2(10 18) #1(18 2 10) free #1 #2 tail #1
# a second free, while the bucket stands
free a r1 -> false; free a p2 -> true; show a -> [0] 4: #2(2 10 18) #1(18 2 10) free #1 #2 tail #1
heap; alloc a x 4 -> #1+18; alloc a y 4 -> #1+2; alloc a z 4 -> #1+10
show a -> [0] 4: #2(2 10 18) #1() free #2 tail #1; alloc a x2 4 -> #2+2; gc a -> false
show a -> [0] 4: #2(10 18) #1() free #2 tail #1; clear a : -[<52|72>] -[<52|72>] -Group
show a -> nothing; alloc a p 4 -> #3+2 : +Group +[<52|72>]; free a p -> true
drop a : -std -[<52|72>] -Group -[<4|8>] -BucketMgr -Mgr
)");
}

TEST(Group, BucketsOfOneRecord) {
  Expect(R"(
set on=1 bucket=12 max=8 min=8; pool a; set keep=1; pool b; heap
alloc a p 4 -> #1+2 : +Group +[<36|56>]; show a -> [0] 4: #1() free tail #1
free a p -> true : -[<36|56>]; show a -> [0] 4: free tail -; alloc a p 4 -> #2+2 : +[<36|56>]
alloc b p 4 -> #3+2 : +Group +[<36|56>]; alloc b q 4 -> #4+2 : +[<36|56>]
show b -> [0] 4: #4() #3() free tail #3; free b p -> true; free b q -> true
show b -> [0] 4: #4(2) #3(2) free #4 #3 tail #3; alloc b r 4 -> #4+2
show b -> [0] 4: #4() #3(2) free #3 tail #3
)");
}

// What a pool's own call never asks: a lookup by the Group itself, and another Group's bucket.
TEST(Group, FreeLooksItsBucketUp) {
  const Observers::Quiet looking;
  Script script;
  script.Run("set on=1\npool a\nalloc a p 4\nalloc a p1 4\nalloc a q 8\nalloc a q1 8\n"
             "alloc a e 2000");
  BucketMgr& pool = *script.Pool("a").GetBucketMgr();
  Group& four = *pool.groups[0];
  std::uint8_t* const p = script.Pointer("p");
  std::uint8_t* const q = script.Pointer("q");
  EXPECT_FALSE(four.Free(nullptr, nullptr));
  EXPECT_FALSE(four.Free(script.Pointer("e"), nullptr)) << "no bucket has it";
  EXPECT_FALSE(four.Free(q, nullptr)) << "another Group's";
  EXPECT_FALSE(four.Free(q, pool.FindBucket(q))) << "another Group's, named";
  EXPECT_FALSE(four.Free(nullptr, four.head1));
  EXPECT_FALSE(four.Free(reinterpret_cast<void*>(4), four.head1)) << "a header at null";
  EXPECT_TRUE(pool.Contains(q) && pool.Contains(p));
  EXPECT_TRUE(four.Free(p, nullptr));
  EXPECT_FALSE(four.Free(p, nullptr)) << "free already";
  EXPECT_FALSE(pool.Contains(p));
  EXPECT_EQ(pool.GetNumBuckets(), 2u);
  EXPECT_EQ(script.Finish(), "");
}

// Out of memory in a new bucket changes nothing; the Group made just before stays.
TEST(Group, OutOfMemory) {
  Expect(R"(
set on=1 bucket=12 max=8 min=8 trace=1
pool a
  |zvpt:c:{a}
heap; fail 1; alloc a p 4 -> bad_alloc : !Group; show a -> nothing; fail 2
alloc a p 4 -> bad_alloc : +Group ![<36|56>]; show a -> [0] 4: free tail -
alloc a p 4 -> #1+2 : +[<36|56>] |
  |zvpt:a:{a}:{p}:4
fail 1; alloc a q 4 -> bad_alloc : ![<36|56>]; show a -> [0] 4: #1() free tail #1
)");
}

} // namespace
