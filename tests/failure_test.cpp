// Each allocation of a script fails in turn.
#include "support/Script.h"

#include <gtest/gtest.h>

namespace {

const char* const calls = R"(set on=1 bucket=26 max=8 min=8
pool a a_name_beyond_sso
alloc a p 4
alloc a q 3
alloc a r 0
alloc a s 4
show a
alloc a e 100
alloc a f 9
size a e
free a e
set keep=1 bucket=100 min=0 max=40 align=8
pool b
alloc b p2 1
alloc b q2 12
alloc b r2 30
alloc b e2 37
mgrs
get b
free a q
free a s
free b p2
has a p
clear a
show a
alloc a p 4
alloc a e 5000
set on=0
pool c c
alloc c x 10
alloc c y 0
free c x
mgrs
pool auto -
alloc auto x 1000
free auto x
drop auto
free c y
show b
clear b
alloc b p2 20
drop a
mgrs
pool a
set trace=0
)";

TEST(Failure, EachAllocationInTurn) {
  for (const std::string trace : {"set trace=0\n", "set trace=1\n"}) {
    std::string wanted;
    unsigned numCalls = 0;
    {
      Script whole;
      wanted = whole.Run(trace + calls);
      EXPECT_EQ(whole.Finish(), "");
      numCalls = whole.heap.numCalls;
    }
    EXPECT_GT(numCalls, 40u);
    for (unsigned k = 1; k <= numCalls; ++k)
      for (const bool andLater : {false, true}) {
        const testing::ScopedTrace row(__FILE__, __LINE__,
                                       "allocation " + std::to_string(k) +
                                           (andLater ? " and later, " : ", ") + trace);
        Script script;
        script.retries = true;
        script.heap.FailAt(k, andLater);
        EXPECT_EQ(script.Run(trace + calls), wanted);
        EXPECT_EQ(script.Finish(), "");
      }
  }
}

} // namespace
