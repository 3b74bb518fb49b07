#include "support/Reports.h"

#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "services/MgrRegistry.h"

#include <gmock/gmock.h>
#include <iomanip>
#include <iostream>
#include <locale>
#include <new>
#include <regex>
#include <set>
#include <sstream>

using namespace VOK::MemPool;
using testing::HasSubstr;

namespace {

// From the first `from` up to the next `to`.
std::string Between(const std::string& text, const std::string& from, const std::string& to) {
  const std::size_t start = text.find(from);
  return text.substr(start, text.find(to, start + 1) - start);
}

std::string Without(std::string text, const std::string& part) {
  return text.erase(text.find(part), part.size());
}

// Four buckets, one of them full, with 505 + 3 used records; two large blocks.
TEST_F(Reports, Pool) {
  Mgr& pool = Make("demo", "");
  const std::vector<void*> records = Alloc(pool, 750, 12);
  for (unsigned i = 0; i < 750; ++i)
    if (i < 5 || i >= 510) pool.Free(records[i]);
  Alloc(pool, 3, 100);
  Alloc(pool, 1, 1500);
  Alloc(pool, 1, 2000);
  ExpectGolden("demo", Report([&] { pool.Dbg(); }));
}

// Size classes with free buckets, a full one, an emptied one and none; a record's size counts as
// rounded up, an ext record's as asked for, and one is too long for its cell.
TEST_F(Reports, PoolInDetail) {
  Mgr& pool = Make("detailed", "bucket=66 max=60 keep=1");
  pool.Free(Alloc(pool, 3, 3)[1]);
  Alloc(pool, 5, 8);
  const std::vector<void*> records = Alloc(pool, 8, 9);
  for (unsigned i = 0; i < 4; ++i)
    pool.Free(records[i]);
  heap.FailAt(2);
  EXPECT_THROW(Alloc(pool, 1, 20), std::bad_alloc);
  pool.Free(Alloc(pool, 2, 53)[0]);
  Alloc(pool, 2, 1501);
  ExtRec::FromData(Alloc(pool, 1, 57)[0])->length = 12345678;
  ExpectGolden("detailed", Report([&] { pool.DbgDetailed(); }));
}

// In the middle of both lists.
TEST_F(Reports, BucketOfTenRecords) {
  Mgr& pool = Make("ten", "bucket=162 max=16");
  const std::vector<void*> records = Alloc(pool, 30, 12);
  for (const unsigned i : {0u, 19u, 18u, 17u, 16u, 15u, 11u, 13u, 20u})
    pool.Free(records[i]);
  const Bucket& bucket = *Bucket::FromData(records[10]);
  const auto report = [&](unsigned number, bool showRecs, bool showFreeList) {
    return Report([&] { bucket.Dbg(std::cout, number, 1, showRecs, showFreeList); });
  };
  const std::string whole = report(1, true, true);
  ExpectGolden("ten", whole);

  const std::string mark = "\n   MemPool::Bucket #001";
  const std::string recs = Between(whole, mark + " ALL RECORDS (", mark + " FREE LIST (");
  const std::string freeList = Between(whole, mark + " FREE LIST (", "\n\n") + "\n";
  EXPECT_EQ(report(1, true, false), Without(whole, freeList));
  EXPECT_EQ(report(1, false, true), Without(whole, recs));
  EXPECT_EQ(report(1, false, false), Without(Without(whole, recs), freeList));
  EXPECT_EQ(report(7, true, true), std::regex_replace(whole, std::regex("#001"), "#007"));
  EXPECT_EQ(report(1000, true, true), std::regex_replace(whole, std::regex("#001"), "#1000"));
}

TEST_F(Reports, BucketOfThreeRecords) {
  Mgr& pool = Make("three", "bucket=50 max=16");
  const Bucket& bucket = *Bucket::FromData(Alloc(pool, 1, 12)[0]);
  ExpectGolden("three", Report([&] { bucket.Dbg(std::cout, 1, 1, true, true); }));
}

TEST_F(Reports, Maps) {
  std::string maps;
  for (const unsigned total : {1u, 8u, 9u, 16u})
    for (const unsigned used : std::set{0u, total / 2, total}) {
      Mgr& pool = Make(std::to_string(total) + "/" + std::to_string(used),
                       "keep=1 max=16 bucket=" + std::to_string(4 + 16 * total));
      void* const first = Alloc(pool, 1, 12)[0];
      const Bucket& bucket = *Bucket::FromData(first);
      if (used == 0) pool.Free(first);
      for (unsigned i = 1; i < used; ++i)
        Alloc(pool, 1, 12);
      const std::string text = Report([&] { bucket.Dbg(std::cout, 1, 0, true, true); });
      maps += Between(text, "MemPool::Bucket #001 ALL RECORDS MAP", "MemPool::Bucket #001 FREE");
    }
  ExpectGolden("maps", maps);
}

// A row's label above 9999 widens the margin of its line alone.
TEST_F(Reports, MapOfTinyRecords) {
  Mgr& pool = Make("tiny", "bucket=65535 align=1 min=5 max=5");
  const Bucket& bucket = *Bucket::FromData(Alloc(pool, 1, 1)[0]);
  const std::string text = Report([&] { bucket.Dbg(std::cout, 1, 0, true, false); });
  EXPECT_THAT(text, HasSubstr("MAP (13106)"));
  EXPECT_THAT(text, HasSubstr("\n9992 | s=5     | "));
  EXPECT_THAT(text, HasSubstr("\n     | o=50002 | o=50007 | o=50012 | o=50017 | "
                              "o=50022 | o=50027 | o=50032 | o=50037 | "
                              "\n10000 | s=5     | s=5     | s=5     | s=5     | "
                              "s=5     | s=5     | s=5     | s=5     | "
                              "\n     | n=50007 | n=50012 | "));
}

// A pool's bars are scaled to its peak, a bucket's show a star a record.
TEST_F(Reports, Bars) {
  const struct {
    unsigned peak, starsOfPeak, starsOfOne;
  } cases[] = {{1, 2, 2},    {49, 50, 2},  {50, 51, 2},  {51, 52, 2}, {60, 61, 2},
               {99, 100, 2}, {100, 51, 1}, {149, 75, 1}, {505, 51, 1}};
  for (const auto& c : cases) {
    const std::string number = std::to_string(c.peak);
    const testing::ScopedTrace row(__FILE__, __LINE__, "peak " + number);
    Mgr& pool = Make(number, "bucket=9000");
    Alloc(pool, c.peak, 9);
    Alloc(pool, 1, 100);
    const std::string text = Report([&] { pool.DbgDetailed(); });
    const auto stars = [](unsigned n) { return " " + std::string(n, '*'); };
    EXPECT_THAT(text, HasSubstr("\n          1      12 " + std::string(9 - number.size(), ' ') +
                                number + stars(c.starsOfPeak) + "\n"));
    EXPECT_THAT(text, HasSubstr("\n          2     100         1" + stars(c.starsOfOne) + "\n"));
    EXPECT_THAT(text, HasSubstr("\n      00001    12 " + std::string(5 - number.size(), ' ') +
                                number + (c.peak > 50 ? stars(50) + "+" : stars(c.peak)) + "\n"));
  }
}

// The map alone keeps its column.
TEST_F(Reports, Depth) {
  Mgr& pool = Make("depth", "");
  Alloc(pool, 3, 12);
  const auto report = [&](unsigned depth) {
    return Report([&] { pool.GetBucketMgr()->Dbg(std::cout, depth, true, true, true); });
  };
  std::istringstream lines(report(0));
  std::string moved;
  bool inMap = false;
  for (std::string line; std::getline(lines, line);) {
    inMap &= !line.empty();
    moved += (inMap || line.empty() ? "" : std::string(12, ' ')) + line + "\n";
    inMap |= line.find("RECORDS MAP (") != std::string::npos;
  }
  EXPECT_EQ(report(4), moved);
}

// By name. None has a bucket: one served nothing, one doesn't pool, one has an emptied size class.
TEST_F(Reports, AllPools) {
  EXPECT_EQ(Report([] { Dbg(); }) + Report([] { DbgDetailed(); }), "");
  Mgr& unused = Make("unused", "");
  Mgr& disabled = Make("disabled", "on=0");
  Mgr& emptied = Make("emptied", "align=8 min=20 max=500 bucket=5000");
  void* const block = Alloc(disabled, 1, 100)[0];
  emptied.Free(Alloc(emptied, 1, 100)[0]);
  const std::string all = Report([] { Dbg(); });
  ExpectGolden("all", all);
  EXPECT_EQ(Report([] { DbgDetailed(); }), all);

  emptied.Clear();
  EXPECT_THAT(Report([&] { emptied.Dbg(); }), HasSubstr("\n   Free BucksM :        0\n"));
  Alloc(unused, 1, 1);
  const auto each = [&] { disabled.DbgDetailed(), emptied.DbgDetailed(), unused.DbgDetailed(); };
  EXPECT_EQ(Report([] { DbgDetailed(); }), Report(each));
  disabled.Free(block);
}

// What a handle holds is what it reports, by name too.
TEST_F(Reports, AssignedHandle) {
  const Mgr& second = Make("second", "");
  auto* const first = new Mgr("first");
  BucketMgr* const own = first->GetBucketMgr();
  *first = second;
  const std::string text = Report([&] { second.Dbg(); });
  EXPECT_EQ(Report([&] { first->Dbg(); }), text);
  EXPECT_EQ(Report([] { Dbg(); }), text + text);
  MgrRegistry::Remove("first");
  delete own;
  operator delete(first);
}

void ExpectState(const std::ostream& os, std::ios::fmtflags flags, std::streamsize precision) {
  EXPECT_EQ(os.flags(), flags);
  EXPECT_EQ(os.precision(), precision);
  EXPECT_EQ(os.fill(), ' ');
  EXPECT_EQ(os.width(), 0);
}

// The digits of a share are those that the stream would form, and its locale's point stands in
// them.
TEST(ReportText, PercentIsTheStreams) {
  static constexpr Column columns[] = {{"% Used", 8}};
  struct Comma : std::numpunct<char> {
    char do_decimal_point() const override { return ','; }
  };
  for (const std::locale& locale : {std::locale::classic(), std::locale({}, new Comma)}) {
    std::ostringstream os;
    os.imbue(locale);
    Table table(os, 0, columns);
    for (std::uint32_t total = 1; total <= 250; ++total)
      for (std::uint32_t used = 0; used <= total; ++used) {
        std::ostringstream expected;
        expected.imbue(locale);
        expected << std::right << std::setw(7) << std::fixed << std::setprecision(3)
                 << used * 100.0 / total << "% ";
        os.str("");
        table.Row().Percent(used * 100.0 / total);
        ASSERT_EQ(os.str(), expected.str()) << used << " of " << total;
      }
  }
}

// The state under which a report starts is part of its text, and some of it stays behind.
TEST_F(Reports, StateOfTheStream) {
  Mgr& pool = Make("state", "bucket=50 max=16");
  const Bucket& bucket = *Bucket::FromData(Alloc(pool, 4, 12)[3]);
  const Mgr& idle = Make("idle", "");
  const struct {
    const char* name;
    void (*set)(std::ostream&);
  } states[] = {{"left", [](std::ostream& os) { os << std::left; }},
                {"left, fill #", [](std::ostream& os) { (os << std::left).fill('#'); }},
                {"internal, fill #", [](std::ostream& os) { (os << std::internal).fill('#'); }},
                {"hex, showbase", [](std::ostream& os) { os << std::hex << std::showbase; }},
                {"boolalpha", [](std::ostream& os) { os << std::boolalpha; }},
                {"showpos", [](std::ostream& os) { os << std::showpos; }},
                {"scientific", [](std::ostream& os) { (os << std::scientific).precision(1); }}};
  const struct {
    const char* name;
    bool hasBucketRow;
    std::function<void(std::ostream&)> write;
  } reports[] = {
      {"pool", true, [&](auto& os) { pool.GetBucketMgr()->Dbg(os, 0, true, true, true); }},
      {"bucket", false, [&](auto& os) { bucket.Dbg(os, 1, 1, true, true); }},
      {"idle pool", false, [&](auto& os) { idle.GetBucketMgr()->Dbg(os, 0, true, true, true); }}};
  std::string changes;
  for (const auto& state : states)
    for (const auto& report : reports) {
      const std::string name = std::string(state.name) + ": " + report.name;
      const testing::ScopedTrace row(__FILE__, __LINE__, name);
      std::ostringstream plain;
      std::ostringstream os;
      state.set(os);
      const auto flags = (os.flags() & ~std::ios::adjustfield) | std::ios::right;
      const auto precision = os.precision();
      report.write(plain);
      report.write(os);
      changes += "== " + name + "\n" + Changes(plain.str(), os.str());
      if (report.hasBucketRow)
        ExpectState(os, (flags & ~std::ios::floatfield) | std::ios::fixed, 3);
      else
        ExpectState(os, flags, precision);
    }
  ExpectGolden("states", changes);

  std::ostringstream dead;
  dead.setstate(std::ios::badbit);
  reports[0].write(dead);
  EXPECT_EQ(dead.str(), "");
}

// At each allocation in turn: the exception comes through, and nothing changes or stays.
TEST_F(Reports, OutOfMemory) {
  Mgr& pool = Make("poor", "");
  Alloc(pool, 3, 12);
  Alloc(pool, 1, 2000);
  const auto before = Standing();
  unsigned k = 0;
  for (bool done = false; !done;) {
    heap.FailAt(++k);
    try {
      const ArenaHeap::Use use;
      pool.GetBucketMgr()->Dbg(std::cout, 6, true, true, true);
      done = true;
    } catch (const std::bad_alloc&) {
    }
    EXPECT_TRUE(Standing() == before) << "at allocation " << k;
  }
  heap.FailAt(0);
  EXPECT_GT(k, 5u) << "what a report takes from the heap isn't seen";
}

} // namespace
