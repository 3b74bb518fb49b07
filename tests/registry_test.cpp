#include "support/Script.h"

#include "engine/BucketMgr.h"
#include "services/MgrRegistry.h"

#include <cstring>
#include <gtest/gtest.h>
#include <iostream>
#include <new>

using namespace VOK::MemPool;

namespace {

// Before main, so that it is the first of the process.
const std::string firstName = MgrRegistry::NextAutomaticName();

unsigned long NextNumber() { return std::stoul(MgrRegistry::NextAutomaticName().substr(14)); }

std::string AutomaticName(unsigned long number) {
  char text[40];
  std::snprintf(text, sizeof text, "__VOK_MEMPOOL_%05lu", number);
  return text;
}

TEST(Registry, PoolsByName) {
  Expect(R"(
mgrs -> 0; get a -> null; get - -> null; heap; pool b : +Mgr +BucketMgr +[<996|1992>] +std
pool a : +Mgr +BucketMgr +[<996|1992>] +std; pool D : +Mgr +BucketMgr +[<996|1992>] +std; heap
mgrs -> 3 D a b; get a -> a; get A -> null; get d -> null; get "" -> null; get - -> null
pool e ""; get "" -> e; get - -> e; mgrs -> 4  D a b; pool ab; mgrs -> 5  D a ab b; drop a
get a -> null; mgrs -> 4  D ab b; pool again a; get a -> again; name again -> a
)");
}

// The entry is gone before the pool tells of its end and before its records go.
TEST(Registry, PoolsOutliveTheRegistry) {
  Expect(R"(
set on=1 trace=1
pool a
  |zvpt:c:{a}
alloc a p 10 -> #1+2
  |zvpt:a:{a}:{p}:10
end; mgrs -> 0; get a -> null; size a p -> 12
alloc a q 10 -> #1+18
  |zvpt:a:{a}:{q}:10
pool b
  |zvpt:c:{b}
mgrs -> 1 b; heap
drop a : | -[<4028|4048>] -Group -[<996|1992>] -BucketMgr -Mgr
  |zvpt:d:{a}
heap; mgrs -> 1 b
)");
}

TEST(Registry, GetMgrsFillsAVector) {
  Script script;
  script.Run("pool b\npool a\npool D");
  Mgr* const wanted[] = {&script.Pool("D"), &script.Pool("a"), &script.Pool("b")};
  VOK::vector<Mgr*> mgrs;
  GetMgrs(mgrs);
  EXPECT_TRUE(std::equal(mgrs.begin(), mgrs.end(), std::begin(wanted), std::end(wanted)));
  EXPECT_EQ(mgrs.capacity, 3u);
  GetMgrs(mgrs);
  EXPECT_EQ(mgrs.count, 6u);
  EXPECT_TRUE(std::equal(mgrs.begin() + 3, mgrs.end(), std::begin(wanted), std::end(wanted)));

  VOK::vector<Mgr*> two;
  two.Reserve(3);
  two.Append(nullptr);
  two.Append(nullptr);
  GetMgrs(two);
  EXPECT_TRUE(two.count == 5 && two.capacity == 6 && two[1] == nullptr && two[4] == wanted[2]);

  std::vector<Mgr*> standard{nullptr};
  GetMgrs(standard);
  EXPECT_EQ(standard, (std::vector<Mgr*>{nullptr, wanted[0], wanted[1], wanted[2]}));

  script.Finish();
  Mgr** const block = mgrs.elems;
  GetMgrs(mgrs);
  EXPECT_TRUE(mgrs.count == 6 && mgrs.elems == block) << "an empty map leaves it untouched";
}

TEST(Registry, AutomaticNames) {
  EXPECT_EQ(firstName, "__VOK_MEMPOOL_00001");
  Script script;
  const unsigned long number = NextNumber();
  script.Run("pool a -\npool named\npool b -\npool Named\n");
  EXPECT_EQ(script.Pool("a").GetName(), AutomaticName(number + 1));
  EXPECT_EQ(script.Pool("b").GetName(), AutomaticName(number + 2));
  EXPECT_EQ(script.Run("mgrs"), "mgrs -> 4 Named " + AutomaticName(number + 1) + " " +
                                    AutomaticName(number + 2) + " named\n");
  script.Run("drop a\npool a -");
  EXPECT_EQ(script.Pool("a").GetName(), AutomaticName(number + 3)) << "none comes again";
  // A pool that fails for want of memory has used its number up.
  unsigned numFailed = 0;
  const std::string wanted = "pool c - -> bad_alloc\n";
  for (unsigned k = 2; script.Run("fail " + std::to_string(k) + "\npool c -").ends_with(wanted);
       ++k)
    ++numFailed;
  EXPECT_GE(numFailed, 6u);
  EXPECT_EQ(script.Pool("c").GetName(), AutomaticName(number + 4 + numFailed));
  EXPECT_EQ(script.Finish(), "");
}

TEST(Registry, AutomaticNamesGrowUnderAnyLocale) {
  const GroupingLocale locale;
  while (NextNumber() < 99998) {
  }
  EXPECT_EQ(MgrRegistry::NextAutomaticName(), "__VOK_MEMPOOL_99999");
  EXPECT_EQ(MgrRegistry::NextAutomaticName(), "__VOK_MEMPOOL_100000");
}

// A second pool of a name, whoever made the name, and whatever the settings say.
TEST(RegistryDeathTest, Duplicate) {
  const std::string automatic = AutomaticName(NextNumber() + 1);
  const std::pair<const char*, const char*> cases[] = {
      {"cache", "cache"}, {"", ""}, {automatic.c_str(), nullptr}};
  for (const auto& [name, again] : cases)
    EXPECT_EXIT(
        {
          const Mgr first(name);
          Set("trace=1 bucket=0");
          std::cout.rdbuf(std::cerr.rdbuf());
          const Mgr second(again);
        },
        testing::ExitedWithCode(1),
        "^ERROR:../s/MemPool:  ...: Duplicate Vok_MemPool::Mgr name encountered '" +
            std::string(name) + "'\n$")
        << name;
}

TEST(Registry, AssignedHandle) {
  Script script;
  script.Run("set on=1\npool a\npool b\nalloc b p 10");
  Mgr& a = script.Pool("a");
  Mgr& b = script.Pool("b");
  BucketMgr* const poolOfA = a.GetBucketMgr();
  EXPECT_EQ(&(a = b), &a);
  EXPECT_EQ(a.GetBucketMgr(), b.GetBucketMgr());
  EXPECT_STREQ(a.GetName(), "b");
  EXPECT_TRUE(a.Contains(script.Pointer("p")));
  EXPECT_TRUE(GetMgr("a") == &a && GetMgr("b") == &b && GetNumMgrs() == 2);
  EXPECT_TRUE(poolOfA->mgr == &a && b.GetBucketMgr()->mgr == &b && poolOfA->name == "a");
  std::memcpy(static_cast<void*>(&a), &poolOfA, sizeof a); // so that both can end
  EXPECT_EQ(script.Finish(), "");
}

} // namespace
