// Pools made to order: options, the limit, and figures as data.
#include "support/Process.h"

#include <MemPool>

#include <gmock/gmock.h>

#include <cstring>
#include <map>
#include <random>
#include <stdexcept>
#include <vector>

namespace {

using namespace VOK::MemPool;

std::string ReportOf(const Mgr& pool) {
  std::ostringstream report;
  pool.Dbg(report);
  return report.str();
}

/// The number in the line of that label.
std::size_t Number(const std::string& report, const std::string& label) {
  return std::stoul(report.substr(report.find(':', report.find(" " + label + " ")) + 1));
}

TEST(Options, ShapeOnePoolAlone) {
  const KeepSettings settings{};
  Set("align=8");
  const Mgr plain("plain");
  const Mgr own("own", Options().On().BucketSize(999).MinRecordSize(12).MaxRecordSize(64));
  Mgr kept(std::string("kept"), {.on = true, .dataAlignment = 2, .keepEmptyBuckets = true});
  EXPECT_TRUE(!plain.IsEnabled() && own.IsEnabled() && !ZOR_VOK_MEMPOOL_ON());
  EXPECT_EQ(Number(ReportOf(own), "Bucket Size"), 999U);
  EXPECT_EQ(Number(ReportOf(own), "Min Rec Sz"), 16U); // rounded to the alignment that is set
  EXPECT_EQ(Number(ReportOf(own), "Max Rec Sz"), 64U);
  EXPECT_EQ(Number(ReportOf(kept), "Data Align"), 2U);
  EXPECT_TRUE(kept.Free(kept.Alloc(3)) && kept.GetStats().emptyBuckets == 1);

  const auto expect = [](const std::string& name, const Options& options, const char* why) {
    try {
      const Mgr pool(name, options);
      ADD_FAILURE() << why;
    } catch (const std::invalid_argument& error) {
      EXPECT_THAT(error.what(), testing::HasSubstr(why));
    }
    EXPECT_EQ(GetNumMgrs(), 3U);
  };
  expect("own", {}, "'own'");
  expect("new", Options().BucketSize(1003), "(1000 + 4 > 1003)");
  expect("new", Options().On().MinRecordSize(1001), "(1008 > 1000)");
  expect("new", Options().DataAlignment(65535), "(65535 > 0)");
  expect("new", Options().DataAlignment(65536), "(65536 > 65535)");
  expect("new", Options().On(false).Limit(1), "a limit needs pooling on");
  for (const Options& just : {Options().BucketSize(1004), Options().MinRecordSize(1000),
                              Options().MinRecordSize(13).MaxRecordSize(13).DataAlignment(0)})
    EXPECT_NO_THROW(Mgr("just", just));

  Output output; // a name in use is refused before anything is constructed
  Set("trace=1");
  expect("own", {}, "'own'");
  Set("trace=0");
  EXPECT_EQ(output.Text(), "");
}

// A bucket's block of 4 records of 8 bytes, and a large one.
constexpr std::size_t bucket = 5 * sizeof(void*) + 6 + 2 + 4 * 8;
constexpr std::size_t large = 2 * sizeof(void*) + 8 + 100;
const Options small = Options().On().BucketSize(34).MaxRecordSize(16);

TEST(Limit, HoldsAtEachSize) {
  for (std::size_t limit = 1; limit < 2 * bucket + 2 * large; ++limit)
    for (const unsigned size : {4U, 100U}) {
      Mgr pool("limited", Options(small).Limit(limit));
      const std::size_t block = size == 4 ? bucket : large;
      const std::size_t most = limit / block * (size == 4 ? 4 : 1);
      for (std::size_t i = 0; i < most; ++i)
        pool.Alloc(size);
      const std::string before = ReportOf(pool);
      EXPECT_THROW(pool.Alloc(size), std::bad_alloc) << limit;
      EXPECT_EQ(pool.GetStats().bytesHeld, limit / block * block);
      EXPECT_TRUE(most == 0 || ReportOf(pool) == before) << limit;
      pool.Reset();
      pool.Clear();
      EXPECT_EQ(pool.GetStats().bytesHeld, 0U);
      EXPECT_EQ(pool.GetStats().peakBytesHeld, limit / block * block);
    }
}

// The program makes room in the same pool when it is asked first, and gives up the second time.
TEST(Limit, AsksTheProgramForRoom) {
  struct Plan {
    void (*act)(Mgr& pool, const std::vector<void*>& held);
    bool serves[3]; // in the order of sizes
  };
  constexpr unsigned sizes[] = {4, 100, bucket + 100}; // the last one takes all of the limit
  constexpr Plan plans[] = {
      {[](Mgr& pool, auto&) { pool.Clear(); }, {true, true, true}},
      {[](Mgr& pool, auto&) { EXPECT_TRUE(pool.Reset()); }, {true, true, false}},
      {[](Mgr& pool, auto& held) { EXPECT_TRUE(pool.Free(held[2])); }, {true, false, false}},
      {[](Mgr& pool, auto& held) { EXPECT_TRUE(pool.Free(held[4])); }, {true, true, false}},
      {[](Mgr&, auto&) {}, {false, false, false}}};
  struct Asked {
    const Plan& plan;
    std::vector<void*> held;
    unsigned times;
    std::size_t bytes;
  };
  const auto atLimit = [](Mgr& pool, std::size_t bytes, void* context) {
    auto& asked = *static_cast<Asked*>(context);
    asked.bytes = bytes;
    if (++asked.times == 2) return false;
    asked.plan.act(pool, asked.held);
    return true;
  };
  for (const Plan& plan : plans)
    for (const std::size_t i : {0U, 1U, 2U}) {
      Asked asked{plan, {}, 0, 0};
      Mgr pool("asking", Options(small).Limit(bucket + large).AtLimit(atLimit, &asked));
      asked.held = {pool.Alloc(4), pool.Alloc(4), pool.Alloc(4), pool.Alloc(4), pool.Alloc(100)};
      EXPECT_THROW(pool.Alloc(bucket + large), std::bad_alloc);
      EXPECT_EQ(asked.times, 0U) << "no answer makes room for this";
      if (plan.serves[i])
        std::memset(pool.Alloc(sizes[i]), 1, sizes[i]);
      else
        EXPECT_THROW(pool.Alloc(sizes[i]), std::bad_alloc);
      EXPECT_EQ(asked.bytes, i == 0 ? bucket : large + sizes[i] - 100);
      EXPECT_EQ(asked.times, plan.serves[i] ? 1U : 2U);
    }
}

// At random states: the figures, the report and the records agree.
TEST(Stats, AgreeWithTheReport) {
  std::mt19937 random(1);
  Mgr pool("random", Options().On().BucketSize(300).MaxRecordSize(100).KeepEmptyBuckets());
  std::map<void*, unsigned> live;
  for (int state = 0; state < 500; ++state) {
    for (int i = 0; i < 20; ++i)
      if (random() % 5 < 3 || live.empty()) {
        const unsigned size = 1 + unsigned(random() % 120);
        live.emplace(pool.Alloc(size), size);
      } else {
        const auto gone = std::next(live.begin(), std::ptrdiff_t(random() % live.size()));
        pool.Free(gone->first);
        live.erase(gone);
      }
    if (state % 100 == 99) {
      pool.Reset();
      live.clear();
    }
    const std::string report = ReportOf(pool);
    const Stats stats = pool.GetStats();
    EXPECT_EQ(stats.usedRecords, Number(report, "Used Recs"));
    EXPECT_EQ(stats.freeRecords, Number(report, "Free Recs"));
    EXPECT_EQ(stats.largeRecords, Number(report, "Ext Recs"));
    EXPECT_EQ(stats.buckets, Number(report, "Num Buckets"));
    EXPECT_EQ(stats.emptyBuckets, Number(report, "Empty"));
    EXPECT_EQ(stats.fullBuckets, Number(report, "Full"));

    std::size_t payload = 0;
    std::size_t count = 0;
    ForEachRecord(pool, [&](void* data, unsigned size) {
      EXPECT_TRUE(live.contains(data) && pool.GetSize(data) == size);
      payload += size;
      ++count;
    });
    EXPECT_TRUE(count == live.size() && count == stats.usedRecords + stats.largeRecords);
    EXPECT_EQ(stats.payload, payload);
    Stats sum{};
    for (const SizeClass& each : pool.GetSizeClasses()) {
      sum.usedRecords += each.usedRecords;
      sum.freeRecords += each.freeRecords;
      sum.emptyBuckets += each.emptyBuckets;
      sum.bytesHeld += each.buckets * (5 * sizeof(void*) + 8) +
                       (each.usedRecords + each.freeRecords) * (each.dataSize + 4);
    }
    ForEachRecord(pool, [&](void*, unsigned size) {
      if (size > 96) sum.bytesHeld += 2 * sizeof(void*) + 8 + size;
    });
    EXPECT_TRUE(sum.usedRecords == stats.usedRecords && sum.freeRecords == stats.freeRecords);
    EXPECT_TRUE(sum.emptyBuckets == stats.emptyBuckets && sum.bytesHeld == stats.bytesHeld);
    EXPECT_GE(stats.peakBytesHeld, stats.bytesHeld);
  }
}

} // namespace
