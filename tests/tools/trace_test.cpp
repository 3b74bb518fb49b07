#include "Pools.h"

#include "Massif.h"
#include "Replay.h"
#include "ReportReader.h"
#include "TraceSummary.h"

#include <algorithm>
#include <gmock/gmock.h>
#include <regex>
#include <set>

using namespace VOK::MemPool;
using namespace VOK::MemPool::Tools;
using testing::HasSubstr;

namespace {

/// Reads the lines of a text up to `last`, and calls `take` for each event.
template <class Take>
void ReadInto(TraceLedger& ledger, const std::string& text, LineNumber last, Take take) {
  std::istringstream in(text);
  LineNumber number = 0;
  for (std::string line; number < last && std::getline(in, line);) {
    TraceEvent event;
    const LineKind kind = ReadTraceLine(line, event);
    ++number;
    if (kind == LineKind::Event) take(event, ledger.Take(number, event));
    if (kind == LineKind::Mixed) ledger.TakeMixed(number, line);
  }
}

TraceLedger LedgerOf(const std::string& text) {
  TraceLedger ledger;
  ReadInto(ledger, text, UINT64_MAX, [](const TraceEvent&, const auto&) {});
  return ledger;
}

/// The live records as "line:size", and "?" for an uncertain one.
std::string LiveOf(const TraceLedger& ledger) {
  std::string text;
  for (const TraceLedger::Live& record : ledger.GetLive())
    text += std::to_string(record.line) + ":" + std::to_string(record.size) +
            (record.isUncertain ? "? " : " ");
  return text;
}

TEST(TraceReader, Lines) {
  const struct {
    const char* line;
    LineKind kind;
  } cases[] = {
      {"zvpt:c:5581c0de", LineKind::Event},
      {"zvpt:d:003a1f40\r", LineKind::Event},
      {"zvpt:a:1:ffffffffffffffff:1073741823", LineKind::Event},
      {"zvpt:a:1:2:0", LineKind::Event},
      {"zvpt:f:1:2:", LineKind::Event},
      {"zvpt:a:1:2:1073741824", LineKind::Mixed},
      {"zvpt:a:1:2:007", LineKind::Mixed},
      {"zvpt:a:1:2:1,000", LineKind::Mixed},
      {"zvpt:a:1:2:", LineKind::Mixed},
      {"zvpt:f:1:2:3", LineKind::Mixed},
      {"zvpt:a:1:10000000000000000:4", LineKind::Mixed},
      {"zvpt:a:1F:2:4", LineKind::Mixed},
      {"zvpt:c:", LineKind::Mixed},
      {"zvpt:c:1:", LineKind::Mixed},
      {"zvpt:e:1", LineKind::Mixed},
      {"zvpt:zvpt:a:1:2:4", LineKind::Mixed},
      {"ready zvpt:c:1", LineKind::Mixed},
      {"zvpt", LineKind::Other},
      {"", LineKind::Other},
  };
  for (const auto& c : cases) {
    TraceEvent event;
    EXPECT_EQ(ReadTraceLine(c.line, event), c.kind) << c.line;
  }
}

// Against a map; the small addresses collide, and the table grows.
TEST(LiveTable, RandomChanges) {
  LiveTable table;
  std::map<std::uint64_t, std::uint64_t> model;
  Random random(3);
  for (std::uint64_t line = 1; line <= 40000; ++line) {
    const std::uint64_t data = random() % 3000 * (random() % 2 == 0 ? 1 : 0x10000);
    LiveRecord* const found = table.Find(data);
    ASSERT_EQ(found == nullptr, !model.contains(data));
    ASSERT_TRUE(found == nullptr || found->line == model.at(data));
    if (found != nullptr && random() % 2 == 0) {
      table.Remove(*found);
      model.erase(data);
    } else {
      table.FindOrAdd(data).line = line;
      model[data] = line;
    }
    ASSERT_EQ(table.GetSize(), model.size());
  }
  table.RemoveIf([](const LiveRecord& record) { return record.line % 2 == 0; });
  std::erase_if(model, [](const auto& entry) { return entry.second % 2 == 0; });
  for (const auto& [data, line] : model)
    EXPECT_EQ(table.Find(data)->line, line);
  EXPECT_EQ(table.GetSize(), model.size());
}

TEST(TraceLedger, PoolsRecordsAndPeak) {
  const TraceLedger ledger = LedgerOf("zvpt:c:a0\n" // 1
                                      "zvpt:a:a0:1000:10\n"
                                      "zvpt:a:a0:2000:20\n"
                                      "a line of the program\n"
                                      "zvpt:c:b0\n" // 5
                                      "zvpt:a:b0:3000:70\n"
                                      "zvpt:f:a0:2000:\n"
                                      "zvpt:f:a0:2000:\n"  // twice
                                      "zvpt:f:a0:3000:\n"  // of the other pool
                                      "zvpt:a:a0:2000:5\n" // 10
                                      "zvpt:d:b0\n"
                                      "zvpt:a:c0:4000:1\n"       // its making isn't in the trace
                                      "zvpt:zvpt:d:a0\nd:c0\n"); // mixed by two threads
  EXPECT_EQ(LiveOf(ledger), "2:10 10:5 12:1 ");
  EXPECT_EQ(ledger.peakBytes, 100u);
  EXPECT_EQ(ledger.peakLine, 6u);
  const std::vector<std::pair<std::uint64_t, std::uint64_t>> atPeak = {{0xb0, 70}, {0xa0, 15}};
  EXPECT_EQ(LedgerOf("zvpt:a:a0:1:15\nzvpt:a:b0:2:70\nzvpt:d:b0\nzvpt:a:c0:3:9\n").GetPoolsAtPeak(),
            atPeak);
  ASSERT_EQ(ledger.gone.count, 1u);
  EXPECT_EQ(ledger.gone.items[0].records, 1u) << "left in the pool when it went";
  ASSERT_EQ(ledger.refused.count, 2u);
  EXPECT_EQ(ledger.refused.items[0].owner, 0u);
  EXPECT_EQ(ledger.refused.items[1].owner, 0xb0u);
  EXPECT_EQ(ledger.lifetimes[1], 1u) << "three trace lines, as one line is the program's";
  ASSERT_EQ(ledger.mixed.count, 1u);
  EXPECT_EQ(ledger.mixed.items[0].line, 13u);
  EXPECT_EQ(ledger.GetStanding().front()->made, 0u);
}

// An address given out again; a second one that the same Clear explains, and narrows it; a second
// Clear; one that another pool's request proves.
TEST(TraceLedger, ProvesClears) {
  const TraceLedger ledger = LedgerOf("zvpt:c:a0\n"
                                      "zvpt:a:a0:1000:1\n"
                                      "zvpt:a:a0:2000:2\n"
                                      "zvpt:a:a0:3000:3\n"
                                      "zvpt:a:a0:1000:4\n" // 5: a Clear between 2 and 5
                                      "zvpt:a:a0:4000:5\n"
                                      "zvpt:a:a0:2000:6\n"   // the same one
                                      "zvpt:f:a0:3000:\n"    // who knows
                                      "zvpt:a:a0:2000:7\n"   // a Clear between 7 and 9
                                      "zvpt:a:b0:2000:8\n"); // a Clear between 9 and 10
  const TracedPool& pool = *ledger.GetStanding().back();
  ASSERT_EQ(pool.clears.count, 3u);
  EXPECT_EQ(pool.clears.items[0].after, 3u);
  EXPECT_EQ(pool.clears.items[0].before, 5u);
  EXPECT_EQ(pool.clears.items[1].after, 7u);
  EXPECT_EQ(pool.clears.items[2].before, 10u);
  EXPECT_EQ(LiveOf(ledger), "5:4? 6:5? 10:8 ");
  EXPECT_EQ(ledger.bytes, 8u);
}

// A pool whose address is used again has none of the old one's records.
TEST(TraceLedger, PoolsOfOneAddress) {
  const TraceLedger ledger = LedgerOf("zvpt:c:a0\nzvpt:a:a0:1000:1\nzvpt:d:a0\n"
                                      "zvpt:c:a0\nzvpt:f:a0:1000:\nzvpt:a:a0:1000:2\nzvpt:c:a0\n");
  EXPECT_EQ(ledger.refused.count, 1u);
  EXPECT_EQ(ledger.numClears, 0u);
  EXPECT_EQ(ledger.gone.count, 2u);
  EXPECT_EQ(ledger.gone.items[1].gone, 0u) << "its end isn't in the trace";
  EXPECT_EQ(LiveOf(ledger), "");
}

/// The data pointers that a report shows in use, with the capacity of the record or the length.
std::map<std::uint64_t, Number> UsedIn(const std::string& text) {
  std::map<std::uint64_t, Number> used;
  for (const Report& report : ReadReports(text)) {
    for (const BucketReport& bucket : report.bucketReports)
      for (const RecordRow& row : bucket.records.rows)
        if (row.type == Type::Used) used[row.addr.value + 4] = row.dataSize;
    for (const ExtRow& row : report.extRecs.rows)
      used[row.data.value] = row.length;
  }
  return used;
}

/// Addresses replaced by their number of first sight.
std::string Numbered(const std::string& text) {
  static const std::regex address("0x[0-9a-f]+");
  std::map<std::string, std::size_t> numbers;
  std::string result;
  auto begin = text.begin();
  for (std::sregex_iterator at(text.begin(), text.end(), address), end; at != end; ++at) {
    result.append(begin, text.begin() + at->position());
    result += "@" + std::to_string(numbers.emplace(at->str(), numbers.size()).first->second);
    begin = text.begin() + at->position() + at->length();
  }
  return result.append(begin, text.end());
}

struct TracedRun {
  std::string trace;  ///< all that was written
  std::string report; ///< in detail, taken behind line `line`
  LineNumber line = 0;
  PoolNames names;
};

/// Two pools at work under trace. Now and then one gets a record of the other, or one a second
/// time while its bucket stands.
TracedRun MakeRun(unsigned seed, const PoolSettings& settings, bool clears) {
  Random random(seed);
  TracedRun run;
  settings.Apply();
  const Captured captured;
  ZOR_VOK_MEMPOOL_TRACE(true);
  WorkedPool pools[] = {WorkedPool("first"), WorkedPool("second")};
  void* const foreign = pools[1].mgr.Alloc(1);
  const unsigned rounds = 2 + random() % 6;
  const auto work = [&] {
    for (WorkedPool& pool : pools)
      pool.Work(random, random() % 120, settings.maxRecordSize);
    EXPECT_FALSE(pools[0].mgr.Free(foreign));
    if (!settings.keepEmptyBuckets) return;
    void* const twice = pools[0].mgr.Alloc(1);
    EXPECT_TRUE(pools[0].mgr.Free(twice));
    EXPECT_FALSE(pools[0].mgr.Free(twice));
  };
  for (unsigned i = 0; i < rounds; ++i)
    work();
  if (clears) {
    pools[0].Alloc(1);
    pools[0].mgr.Clear();
    pools[0].held.clear();
    pools[0].Alloc(1);
    work();
  }
  run.trace = captured.Get();
  run.line = static_cast<LineNumber>(std::count(run.trace.begin(), run.trace.end(), '\n'));
  DbgDetailed();
  run.report = captured.Get().substr(run.trace.size());
  work();
  run.trace = captured.Get();
  for (const WorkedPool& pool : pools) {
    std::ostringstream addr;
    addr << static_cast<const void*>(pool.mgr.GetBucketMgr());
    run.names[std::stoull(addr.str(), nullptr, 16)] = pool.mgr.GetName();
  }
  return run;
}

/// The lines of a run that stand in front of its report, and those behind it.
std::string TraceUpTo(const TracedRun& run) {
  return run.trace.substr(0, run.trace.find(run.report));
}

TEST(TraceLedger, LiveRecordsOfRandomRuns) {
  for (unsigned seed = 0; seed < 200; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const TracedRun run = MakeRun(seed, PoolSettings::Any(random), false);
    const TraceLedger ledger = LedgerOf(TraceUpTo(run));
    const std::map<std::uint64_t, Number> used = UsedIn(run.report);
    const std::vector<TraceLedger::Live> live = ledger.GetLive();
    ASSERT_EQ(live.size(), used.size());
    for (const TraceLedger::Live& record : live) {
      ASSERT_TRUE(used.contains(record.data));
      EXPECT_LE(record.size, used.at(record.data));
      EXPECT_FALSE(record.isUncertain);
    }
    EXPECT_EQ(ledger.numClears, 0u);
    EXPECT_EQ(ledger.mixed.count, 0u);
  }
}

TEST(TraceLedger, ClearsOfRandomRuns) {
  for (unsigned seed = 0; seed < 30; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const TracedRun run = MakeRun(seed, PoolSettings::Any(random), true);
    const TraceLedger ledger = LedgerOf(TraceUpTo(run));
    EXPECT_GE(ledger.numClears, 1u);
    std::set<std::uint64_t> certain;
    for (const TraceLedger::Live& record : ledger.GetLive())
      if (!record.isUncertain) certain.insert(record.data);
    for (const std::uint64_t data : certain)
      EXPECT_TRUE(UsedIn(run.report).contains(data)) << "certain, and not in use";
  }
}

TEST(Replay, ReportAtALine) {
  for (unsigned seed = 0; seed < 60; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    const PoolSettings settings = PoolSettings::Any(random);
    const TracedRun run = MakeRun(seed, settings, false);
    settings.Apply();
    const Captured captured;
    TraceLedger ledger;
    Replay replay(run.names);
    ReadInto(ledger, run.trace, run.line,
             [&](const TraceEvent& event, const auto& verdict) { replay.Take(event, verdict); });
    replay.Print(true);
    ASSERT_EQ(Numbered(captured.Get()), Numbered(run.report));
  }
}

TEST(TraceSummary, NamesWhatItFinds) {
  const std::string text = SummariseTrace(LedgerOf("zvpt:c:a0\nzvpt:a:a0:1000:24\nzvpt:f:a0:1:\n"
                                                   "zvpt:a:a0:1000:8\nx zvpt:\n"),
                                          5, {{0xa0, "cache"}});
  for (const char* const part :
       {"cache: made line 1", "line 4: 8 bytes at 1000 of cache", "line 3: 1 to cache",
        "a Clear between line 2 and line 4", "line 5: x zvpt:", "peak of live bytes: 24 at line 2"})
    EXPECT_THAT(text, HasSubstr(part));
}

// At most a hundred samples however long the trace, with the peak among them.
TEST(Massif, SamplesAndPeak) {
  TraceLedger ledger;
  Massif massif;
  for (LineNumber line = 1; line <= 5000; ++line) {
    const bool grows = line <= 2501;
    ledger.Take(line, {grows ? 'a' : 'f', 0xa0, (grows ? line : line - 2501) << 4, 10});
    massif.Sample(ledger);
  }
  const std::string text = massif.GetText(ledger, {}, "trace.txt");
  EXPECT_THAT(text, HasSubstr("time=2501\nmem_heap_B=25010\nmem_heap_extra_B=0\nmem_stacks_B=0\n"
                              "heap_tree=peak\nn1: 25010 (requests of pools, line 2501)\n"
                              " n0: 25010 pool a0\n"));
  EXPECT_THAT(text, HasSubstr("time=5000\nmem_heap_B=20\n"));
  EXPECT_THAT(text, testing::Not(HasSubstr("snapshot=102")));
}

} // namespace
