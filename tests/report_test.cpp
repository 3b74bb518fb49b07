// The texts of the reports, to the space: golden texts of whole reports, and of what the state of
// the stream or a damage changes in them. The pools are on an arena, so that addresses are the same
// in every run.
#include "support/Pools.h"

#include "engine/Bucket.h"
#include "engine/ExtRec.h"

#include <cfenv>
#include <cstdlib>
#include <fstream>
#include <iomanip>
#include <regex>
#include <set>
#include <span>

using testing::HasSubstr;

namespace {

using namespace VOK::MemPool;

class Reports : public Pools {
protected:
  Output output;

  static void Write(const Mgr& pool, std::ostream& os) {
    pool.GetBucketMgr()->Dbg(os, 6, true, true, true);
  }

  /// What `report` writes on standard output, messages with "#####" for their source line.
  std::string Report(const std::function<void()>& report) {
    report();
    const std::string text = output.Text();
    EXPECT_EQ(std::ranges::count(text, '\n'), std::exchange(output.numFlushes, 0));
    static const std::regex place(":../s/MemPool:[ 0-9]{5}: ");
    return std::regex_replace(text, place, ":../s/MemPool:#####: ");
  }

  /// The same report to a stream of the program must have the same text.
  std::string Report(const std::function<void()>& report,
                     const std::function<void(std::ostream&)>& toStream) {
    std::ostringstream stream;
    toStream(stream);
    const std::string text = Report(report);
    EXPECT_EQ(stream.str(), text);
    return text;
  }

  /// Expects the golden text of that name, which both pointer widths have. While
  /// VOK_MEMPOOL_APPROVE is in the environment it writes that text.
  void ExpectGolden(const std::string& name, const std::string& report) const {
    const std::string path = VOK_MEMPOOL_GOLDEN "/report/" + name + ".txt";
    const std::string text = Narrowed(report);
    if (std::getenv("VOK_MEMPOOL_APPROVE") != nullptr)
      std::ofstream(path, std::ios::binary) << text;
    std::ostringstream golden;
    golden << std::ifstream(path).rdbuf();
    EXPECT_EQ(text, golden.str()) << "golden file: " << path;
  }

private:
  /// The text with the sizes of 4-byte pointers, and with the blocks that it names 64 KiB apart, in
  /// its order.
  std::string Narrowed(const std::string& text) const {
    static const std::map<std::string, std::string> sizes = {
        {"88", "64"}, {"0x58", "0x40"}, {"8.8", "6.4"},  // a BucketMgr's
        {"48", "28"}, {"0x30", "0x1c"}, {"4.8", "2.8"}}; // a Bucket's
    static const std::regex token(
        "(0x2[0-9a-f]{7})|((?:Sizeof[ Buck]*|Hdr Offset  ): [ #+]*)([0-9a-fx.]+)");
    std::map<std::uintptr_t, std::uintptr_t> places;
    std::ostringstream narrowed;
    auto rest = text.begin();
    for (std::sregex_iterator at(text.begin(), text.end(), token), end; at != end; ++at) {
      const std::smatch& match = *at;
      narrowed << std::string(rest, match[0].first) << match[2];
      rest = match[0].second;
      if (match[1].matched)
        narrowed << PlaceOf(std::stoul(match[1], nullptr, 16), places);
      else
        narrowed << (sizes.contains(match[3]) ? sizes.at(match[3]) : match[3].str());
    }
    narrowed << std::string(rest, text.end());
    return narrowed.str();
  }

  /// What lies behind a header is as far behind it.
  const void* PlaceOf(std::uintptr_t address,
                      std::map<std::uintptr_t, std::uintptr_t>& places) const {
    std::set<std::uintptr_t> blocks;
    for (const ArenaHeap::Event& event : heap.events)
      if (event.kind == '+' && event.block <= reinterpret_cast<void*>(address))
        blocks.insert(reinterpret_cast<std::uintptr_t>(event.block));
    const std::uintptr_t block = *blocks.rbegin();
    const auto place = places.try_emplace(block, 0x20000000 + (places.size() << 16)).first->second;
    const bool isExt = ExtRec::FromData(reinterpret_cast<void*>(block + sizeof(ExtRec))) != nullptr;
    const std::size_t excess = isExt ? sizeof(ExtRec) - 16 : sizeof(Bucket) - 28;
    return reinterpret_cast<void*>(place + (address - block) - (address == block ? 0 : excess));
  }
};

/// The lines of `after` that `before` lacks, below its number of lines.
std::string Changes(const std::string& before, const std::string& after) {
  std::string changes = std::to_string(std::count(after.begin(), after.end(), '\n')) + " lines\n";
  std::istringstream lines(after);
  for (std::string line; std::getline(lines, line);)
    if (("\n" + before).find("\n" + line + "\n") == std::string::npos) changes += line + "\n";
  return changes;
}

// Four buckets, one of them full, with 505 + 3 used records; two large blocks.
TEST_F(Reports, Pool) {
  Mgr& pool = Make("demo");
  const std::vector<std::uint8_t*> records = Alloc(pool, 750, 12);
  for (unsigned i = 0; i < 750; ++i)
    if (i < 5 || i >= 510) pool.Free(records[i]);
  Alloc(pool, 3, 100);
  Alloc(pool, 1500);
  Alloc(pool, 2000);
  ExpectGolden("demo", Report([&] { pool.Dbg(); }, [&](std::ostream& os) { pool.Dbg(os); }));
}

// Size classes with free buckets, a full one, an emptied one and none; both lists of buckets in an
// order of their own; a record's size counts as rounded up, an ext record's as asked for, and one
// is too long for its cell. The maps have 1, 8, 10 and 16 boxes.
TEST_F(Reports, PoolInDetail) {
  Mgr& pool = Make("detailed", "bucket=130 max=124 keep=1");
  pool.Free(Alloc(pool, 3, 3)[1]);
  Alloc(pool, 10, 8);
  const std::vector<std::uint8_t*> records = Alloc(pool, 24, 9);
  for (const unsigned i : {3u, 0u, 1u, 2u, 7u, 6u, 5u, 4u, 22u, 16u, 19u, 9u})
    pool.Free(records[i]);
  heap.FailAt(2);
  EXPECT_THROW(Alloc(pool, 20), std::bad_alloc);
  pool.Free(Alloc(pool, 2, 117)[0]);
  Alloc(pool, 2, 1501);
  ExtRec::FromData(Alloc(pool, 121))->length = 12345678;
  ExpectGolden("detailed", Report([&] { pool.DbgDetailed(); },
                                  [&](std::ostream& os) { pool.DbgDetailed(os); }));

  // A report to a dead stream ends as any other. An exception comes through and nothing is left.
  std::ostream nowhere(nullptr);
  Write(pool, nowhere);
  for (unsigned k = 1; k <= 40; ++k) {
    heap.FailAt(k);
    const ArenaHeap::Use use;
    EXPECT_THROW(Write(pool, nowhere), std::bad_alloc);
  }
}

// By name. None has a bucket: one served nothing, one doesn't pool, one has an emptied size class.
TEST_F(Reports, AllPools) {
  EXPECT_EQ(Report([] { Dbg(), DbgDetailed(); }), "");
  Mgr& unused = Make("unused");
  Mgr& disabled = Make("disabled", "on=0");
  Mgr& emptied = Make("emptied", "align=8 min=20 max=500 bucket=5000");
  void* const block = Alloc(disabled, 100);
  emptied.Free(Alloc(emptied, 100));
  ExpectGolden("all", Report([] { Dbg(); }, [](std::ostream& os) { Dbg(os); }));
  disabled.Free(block);

  // What a handle holds is what it reports. A pool's bars are scaled to its peak, a bucket's show a
  // star a record.
  emptied.Clear();
  Alloc(unused, 99, 9);
  Alloc(unused, 50, 40);
  BucketMgr* const own = disabled.GetBucketMgr();
  EXPECT_TRUE(&(disabled = emptied) == &disabled && GetMgr("disabled") == &disabled);
  EXPECT_TRUE(own->mgr == &disabled && disabled.GetName() == std::string("emptied"));
  ExpectGolden("all-detailed",
               Report([] { DbgDetailed(); }, [](std::ostream& os) { DbgDetailed(os); }));
  std::memcpy(static_cast<void*>(&disabled), &own, sizeof(Mgr));
}

// The state under which a report starts is part of its text, and some of it stays.
TEST_F(Reports, StateOfTheStream) {
  const std::pair<const char*, void (*)(std::ostream&)> states[] = {
      {"left, fill #", [](std::ostream& os) { os << std::left << std::setfill('#'); }},
      {"internal, fill #", [](std::ostream& os) { os << std::internal << std::setfill('#'); }},
      {"hex, showbase", [](std::ostream& os) { os << std::hex << std::showbase; }},
      {"boolalpha", [](std::ostream& os) { os << std::boolalpha; }},
      {"showpos", [](std::ostream& os) { os << std::showpos; }},
      {"scientific", [](std::ostream& os) { os << std::scientific << std::setprecision(1); }},
      {"grouped digits", [](std::ostream& os) { os.imbue(Grouping()); }}};
  Alloc(Make("state", "bucket=50 max=16"), 4, 12);
  Make("idle");
  std::string changes;
  for (const auto& pool : pools) {
    std::ostringstream plain;
    Write(*pool, plain);
    for (const auto& [name, set] : states) {
      std::ostringstream os;
      set(os);
      Write(*pool, os);
      const std::string report = os.str();
      os.str("");
      os << std::setw(9) << 0.25;
      changes += std::string("== ") + pool->GetName() + ", " + name + ", leaves " + os.str() +
                 ", " + Changes(plain.str(), report);
    }
  }
  ExpectGolden("states", changes);

  // A fraction is formed as the platform's stream forms it, also where the process rounds up.
  const volatile double hundred = 100;
  std::ostringstream os;
  std::ostringstream third;
  std::fesetround(FE_UPWARD);
  Write(*pools[0], os);
  third << std::fixed << std::setprecision(3) << hundred / 3 << "% ";
  std::fesetround(FE_TONEAREST);
  EXPECT_THAT(os.str(), HasSubstr(third.str()));
}

TEST_F(Reports, DamagedBucket) {
  Mgr& pool = Make("damaged", "bucket=162 max=16");
  const std::vector<std::uint8_t*> records = Alloc(pool, 5, 12);
  pool.Free(records[1]);
  pool.Free(records[3]);
  Bucket& bucket = *Bucket::FromData(records[0]);
  const std::span bytes(reinterpret_cast<std::uint8_t*>(&bucket), recsBaseOffset + bucket.recsSize);
  ArenaHeap::Unpoison(bytes.data(), bytes.size());
  const std::vector<std::uint8_t> whole(bytes.begin(), bytes.end());
  std::ostringstream before;
  Write(pool, before);

  // A field is at its distance from offset 0, as a record is.
  const std::map<std::string, int> fields{
      {"recsSize", -6}, {"recSize", -4}, {"freeHead", -2}, {"freeRecs", 0}};
  // Pairs of a field or an offset, and its new value; a record has its type 2 bytes on.
  const auto damage = [&](const std::string& text) {
    std::ranges::copy(whole, bytes.begin());
    std::istringstream words(text);
    std::uint16_t value;
    for (std::string place; words >> place >> value;) {
      const bool isField = fields.contains(place);
      auto* const at = &bytes[recsBaseOffset] + (isField ? fields.at(place) : std::stoi(place));
      const std::uint8_t lowFirst[] = {std::uint8_t(value), std::uint8_t(value >> 8)};
      std::memcpy(at, isField ? static_cast<const void*>(&value) : lowFirst, sizeof value);
    }
  };
  const auto report = [&](bool showRecs, bool showFreeList) {
    return Report([&] { bucket.Dbg(std::cout, 1000, 1, showRecs, showFreeList); });
  };
  EXPECT_THAT(report(true, false), Not(HasSubstr("FREE LIST")));
  EXPECT_THAT(report(false, true), Not(HasSubstr("ALL RECORDS")));

  damage("recSize 15 18 50"); // each warning is below the row that sets it off
  ExpectGolden("warnings", report(true, true));

  // What each damage changes, and the warnings, on standard output wherever the report goes.
  std::string changes;
  std::istringstream damages(
      "recSize 0,recSize 3 recsSize 11,recSize 160,recSize 161,recSize 65535,recsSize 1,recsSize 2,"
      "recsSize 4,recsSize 5,recsSize 161,recsSize 150,recsSize 149,freeRecs 0,freeRecs 10,"
      "freeRecs 11,freeHead 0,freeHead 1,freeHead 158 158 0,freeHead 159,18 1,18 159,18 65535,"
      "50 50,146 50,146 2 2 0,20 1,36 0,4 2 20 3 52 255");
  for (std::string text; std::getline(damages, text, ',');) {
    damage(text);
    std::ostringstream os;
    const std::string warnings = Report([&] { Write(pool, os); });
    changes.append("== ").append(text).append(", ");
    changes.append(Changes(before.str(), os.str())).append(warnings);
  }
  ExpectGolden("damages", changes);

  // All walks end and stay in the block, which the address sanitizer checks, and write nothing
  // into it. Nothing in a bucket documents the size of its block, so its area only shrinks.
  std::istringstream places("recsSize recSize freeHead freeRecs 2 4 18 20 34 36 50 52 66 68 82 84 "
                            "98 100 114 116 130 132 146 148");
  for (std::string place; places >> place;)
    for (unsigned value = 0; value < (place == "recsSize" ? 162 : 65536);
         value += 1 + value / 300 * 99) {
      damage(place + " " + std::to_string(value));
      const std::vector<std::uint8_t> damaged(bytes.begin(), bytes.end());
      Write(pool, std::cout);
      EXPECT_LT(std::exchange(output.numFlushes, 0), 600) << place << ' ' << value;
      EXPECT_TRUE(std::ranges::equal(damaged, bytes) && !output.Text().empty());
    }
  damage("");
}

} // namespace
