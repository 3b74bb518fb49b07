// Checked pools: each fault is found once, and sound programs hear nothing.
#include "support/ArenaHeap.h"
#include "support/Process.h"

#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Invariants.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <optional>
#include <random>
#include <set>
#include <vector>

namespace {

using namespace VOK::MemPool;
using Kind = Finding::Kind;
using Byte = std::uint8_t;

/// A checked pool, its findings, and the lines on std::cout without what names the source line.
struct Fixture {
  std::vector<Finding> findings;
  std::ostringstream text;
  std::streambuf* const before = std::cout.rdbuf(text.rdbuf());
  std::optional<Mgr> pool;

  explicit Fixture(Options options = Options().BucketSize(200).MaxRecordSize(40))
      : pool(std::in_place, "checked",
             options.On().Checked().AtFinding(
                 [](Mgr&, const Finding& finding, void* all) {
                   static_cast<std::vector<Finding>*>(all)->push_back(finding);
                 },
                 &findings)) {}
  ~Fixture() { std::cout.rdbuf(before); }

  Byte* Alloc(unsigned size) { return static_cast<Byte*>(pool->Alloc(size)); }
  bool IsSound() const { return IsValid(*pool->GetBucketMgr()); }

  /// All lines so far, which must be as many as the findings.
  std::string Lines() {
    std::string lines = text.str();
    for (std::size_t at = 0; (at = lines.find("WARNING:../s/MemPool:", at)) != std::string::npos;)
      lines.erase(at, sizeof "WARNING:../s/MemPool:12345: " - 1);
    return lines;
  }
};

std::string Line(const char* what, const void* p, const std::string& rest) {
  std::ostringstream line;
  line << "Pool 'checked': " << what << "0x" << std::hex << reinterpret_cast<std::uintptr_t>(p)
       << rest << '\n';
  return line.str();
}

struct Fault {
  Kind kind;
  const char* what;
  unsigned heldBack;
  void (*plant)(Mgr& pool, Byte* p, unsigned size);
};

const Fault faults[] = {
    {Kind::SecondFree, "second Free of ", 9,
     [](Mgr& pool, Byte* p, unsigned) { EXPECT_TRUE(pool.Free(p) && !pool.Free(p)); }},
    {Kind::StrayFree, "Free of ", 0,
     [](Mgr& pool, Byte* p, unsigned) { EXPECT_TRUE(!pool.Free(p + 4) && pool.Free(p)); }},
    {Kind::Overrun, "write beyond the end of ", 9,
     [](Mgr&, Byte* p, unsigned size) { p[size] = 0; }},
    {Kind::Overrun, "write beyond the end of ", 0,
     [](Mgr& pool, Byte* p, unsigned size) {
       p[size < 100 ? (size + 7) / 4 * 4 - 1 : size + 3] = 0; // the last one that the record has
       EXPECT_TRUE(pool.Free(p));
     }},
    {Kind::WriteAfterFree, "write after Free to ", 9,
     [](Mgr& pool, Byte* p, unsigned) { pool.Free(p), p[0] = 0; }},
    {Kind::WriteAfterFree, "write after Free to ", 1,
     [](Mgr& pool, Byte* p, unsigned size) {
       pool.Free(p), p[size - 1] = 0;
       void* const next = pool.Alloc(size);
       EXPECT_TRUE(next != p && pool.Free(next)); // which pushes `p` out
     }},
    {Kind::WriteAfterFree, "write after Free to ", 0,
     [](Mgr& pool, Byte* p, unsigned) { pool.Free(p), p[0] = 0; }}, // its bucket goes with the last
    {Kind::StillInUse, "still in use at the end: ", 9, [](Mgr&, Byte*, unsigned) {}}};

// In buckets of 3 to 9 records and in large blocks. The other records are freed ahead of the
// pool's end.
TEST(Checked, FindsEachFaultOnce) {
  for (const Fault& fault : faults)
    for (unsigned size = 1; size <= 108; size = size == 16 ? 100 : size + 1)
      for (const std::size_t place : {0U, 1U, 2U}) {
        if (size >= 100 && fault.heldBack == 0 && fault.kind == Kind::WriteAfterFree) continue;
        Fixture f(Options().BucketSize(200).MaxRecordSize(40).HeldBack(fault.heldBack));
        std::vector<Byte*> all{f.Alloc(size)};
        const std::size_t most = size < 100 ? f.pool->GetStats().freeRecords + 1 : 3;
        while (all.size() < most)
          all.push_back(f.Alloc(size));
        const std::size_t index = place * (most - 1) / 2;
        Byte* const p = all[index];
        fault.plant(*f.pool, p, size);
        EXPECT_TRUE(f.IsSound());
        SCOPED_TRACE(testing::Message() << fault.what << size << " at " << index);
        const bool isStray = fault.kind == Kind::StrayFree;
        for (Byte* other : all)
          EXPECT_TRUE(other == p || f.pool->Free(other));
        f.pool.reset();
        ASSERT_EQ(f.findings.size(), 1U) << f.Lines();
        EXPECT_EQ(f.findings[0].kind, fault.kind);
        EXPECT_EQ(f.findings[0].size, isStray ? 0 : size);
        EXPECT_EQ(f.Lines(), Line(fault.what, p + 4 * isStray,
                                  isStray ? ", no record of this pool"
                                          : ", a record of " + std::to_string(size) +
                                                " bytes, request " + std::to_string(index + 1)));
      }
}

// A record of a released bucket, one of another pool, and addresses where nothing is.
TEST(Checked, ReadsNoStrayPointer) {
  Fixture f(Options().HeldBack(0));
  Mgr other("other", Options().On());
  Byte* const released = f.Alloc(8);
  EXPECT_TRUE(f.pool->Free(released) && !f.pool->Free(nullptr));
  for (Byte* p : {released, static_cast<Byte*>(other.Alloc(8)), reinterpret_cast<Byte*>(16),
                  reinterpret_cast<Byte*>(-16)})
    EXPECT_TRUE(!f.pool->Free(p) && !f.pool->Contains(p) && f.pool->GetSize(p) == 0);
  EXPECT_TRUE(f.pool->GetNumFindings() == 4 && other.GetNumFindings() == 0);
  EXPECT_TRUE(f.pool->IsObserved() && !other.IsObserved());
}

// Each byte of each header, found at a Free, at an Alloc and by Clear; the pool stays sound.
TEST(Checked, FindsAndMendsDamagedHeaders) {
  const int bucketHeader = 5 * sizeof(void*) + 8;
  const int extHeader = 2 * sizeof(void*) + 8;
  for (const unsigned size : {8U, 100U})
    for (int at = size == 8 ? -bucketHeader - 4 : -extHeader; at < (size == 8 ? -1 : 0); ++at)
      for (const int finder : {0, 1, 2}) {
        if (finder == 1 && (size == 100 || at >= -4)) continue; // Alloc reads no used record
        Fixture f(Options().BucketSize(66).MaxRecordSize(40).HeldBack(0));
        Byte* all[10];
        for (Byte*& p : all)
          p = f.Alloc(size);
        f.Alloc(24);
        EXPECT_TRUE(f.pool->Free(all[5])); // its bucket, in the middle, serves next
        Byte* const p = all[4];
        p[at] ^= 0x50; // of a free list's head it makes the end of the bucket
        EXPECT_TRUE(finder != 0 || (f.pool->Free(p) && !f.pool->Contains(p)));
        if (finder == 1) f.Alloc(size);
        if (finder == 2) f.pool->Clear();
        SCOPED_TRACE(testing::Message() << size << " at " << at << " by " << finder);
        ASSERT_EQ(f.findings.size(), 1U) << f.Lines();
        EXPECT_EQ(f.findings[0].kind, Kind::DamagedHeader);
        // Free tests the record. Clear may find a broken link from either of its ends.
        const bool isBucket = size == 8 && at < -4 && finder != 0;
        const std::string rest = ", a record of " + std::to_string(size) + " bytes, request 5";
        const std::string lines = f.Lines();
        if (finder == 2 && at != -4 && at != -3 && at != -2)
          EXPECT_TRUE(lines.starts_with("Pool 'checked': damaged header of 0x") &&
                      (size == 100 || lines.ends_with(", a bucket\n")))
              << lines;
        else
          EXPECT_EQ(lines, Line("damaged header of ", isBucket ? p - 4 - bucketHeader : p,
                                isBucket ? ", a bucket" : rest));
        EXPECT_TRUE(f.IsSound());
        EXPECT_TRUE(finder != 0 || size != 8 || f.Alloc(8) != p) << "it serves no more";
        for (Byte* other : all)
          EXPECT_TRUE(finder == 2 || other == all[5] || other == p || f.pool->Free(other));
        f.pool->Clear();
        EXPECT_EQ(f.pool->GetNumFindings(), 1U) << f.Lines();
      }
}

TEST(Checked, FindsALinkThatSkipsALargeBlock) {
  Fixture f;
  Byte* all[3];
  for (Byte*& p : all)
    p = f.Alloc(100);
  ExtRec::FromData(all[2])->next = ExtRec::FromData(all[0]);
  EXPECT_TRUE(f.pool->Free(all[2]) && f.IsSound());
  EXPECT_EQ(f.Lines(), Line("damaged header of ", all[2], ", a record of 100 bytes, request 3"));
  f.pool->Clear();
}

TEST(Checked, ServesNoRecordByABrokenFreeList) {
  for (const int at : {-4, -3, -2, 0})
    for (const int number : {1, 3}) {
      Fixture f(Options().BucketSize(66).MaxRecordSize(40).HeldBack(0));
      Byte* all[4];
      for (Byte*& p : all)
        p = f.Alloc(8);
      for (int i = 0; i < number; ++i)
        f.pool->Free(all[i]);
      Byte* const p = all[number - 1];
      p[at] ^= 2;
      Byte* const served = f.Alloc(8);
      EXPECT_EQ(f.Lines(), Line(at < 0 ? "broken free list at " : "write after Free to ", p,
                                ", a record of 8 bytes, request " + std::to_string(number)));
      EXPECT_TRUE(f.IsSound() && served != all[3]);
      f.pool->Clear();
    }
}

// It serves no more, and is reported once.
TEST(Checked, FindsAWriteToARecordNeverAllocated) {
  Fixture f(Options().BucketSize(66).MaxRecordSize(40));
  Byte* const p = f.Alloc(8);
  p[16 + 11] = 0; // the last byte that it has
  EXPECT_EQ(f.Alloc(8), p + 32);
  f.pool->Clear();
  EXPECT_EQ(f.Lines(), Line("write after Free to ", p + 16, ", a record never allocated"));
}

TEST(Checked, TestsAllWhenAllIsFreed) {
  for (const bool isReset : {false, true}) {
    Fixture f(Options().HeldBack(3));
    Byte* const p = f.Alloc(8);
    f.Alloc(8);
    f.Alloc(5000);
    EXPECT_TRUE(f.pool->Free(p));
    p[0] = 0;
    EXPECT_TRUE(isReset ? f.pool->Reset() : (f.pool->Clear(), true));
    EXPECT_EQ(f.Lines(), Line("write after Free to ", p, ", a record of 8 bytes, request 1"));
    const Stats stats = f.pool->GetStats();
    EXPECT_EQ(stats.usedRecords + stats.largeRecords, 0U);
    EXPECT_EQ(stats.buckets, isReset ? 1U : 0U);
    std::set<Byte*> served; // nothing is held back any more, and then the first three are
    for (int i = 0; i < 4; ++i)
      EXPECT_TRUE(f.pool->Free(*served.insert(f.Alloc(8)).first));
    EXPECT_TRUE(served.size() == 4 && f.IsSound());
    f.pool.reset();
    EXPECT_EQ(f.findings.size(), 1U) << f.Lines();
  }
}

// At the limit even the last record that is held back makes room.
TEST(Checked, ReleasesWhatIsHeldBackAtTheLimit) {
  Fixture f(Options().BucketSize(66).MaxRecordSize(40).Limit(5 * sizeof(void*) + 8 + 64));
  for (const unsigned size : {8U, 30U, 8U})
    EXPECT_TRUE(f.pool->Free(f.Alloc(size)));
  EXPECT_EQ(f.Lines(), "");
}

TEST(Checked, ShortensTheLinesOfManyRecords) {
  for (const int number : {10, 12}) {
    Fixture f;
    for (int i = 0; i < number; ++i)
      f.Alloc(100);
    f.pool.reset();
    const std::string lines = f.Lines();
    EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), std::min(number, 11));
    EXPECT_EQ(lines.ends_with("\nPool 'checked': 2 more still in use at the end\n"), number == 12);
    EXPECT_EQ(f.findings.size(), unsigned(number));
  }
}

// Random requests whose every byte is used, at several shapes; the limit is reached at times.
TEST(Checked, SaysNothingOfASoundProgram) {
  const char* const text = std::getenv("VOK_MEMPOOL_STEPS");
  const long numSteps = text != nullptr ? std::atol(text) : 50000;
  std::mt19937 random(1);
  for (const unsigned alignment : {1U, 4U, 8U, 12U}) {
    Fixture f(Options()
                  .BucketSize(300)
                  .MaxRecordSize(100)
                  .DataAlignment(alignment)
                  .KeepEmptyBuckets(alignment == 8)
                  .Limit(40000));
    std::vector<std::pair<Byte*, unsigned>> live;
    for (long step = 0; step < numSteps / 4; ++step) {
      if (const auto size = unsigned(random() % 120); random() % 32 < 17 && live.size() < 100) {
        live.emplace_back(f.Alloc(size), size);
        ASSERT_EQ(f.pool->GetSize(live.back().first), size);
        std::memset(live.back().first, int(size), size);
      } else if (!live.empty()) {
        std::swap(live[random() % live.size()], live.back());
        const auto [p, its] = live.back();
        ASSERT_TRUE(f.pool->Contains(p) && unsigned(std::count(p, p + its, Byte(its))) == its &&
                    f.pool->Free(p));
        ASSERT_TRUE(!f.pool->Contains(p) && f.pool->GetSize(p) == 0);
        live.pop_back();
      }
      if (step % 5000 == 4999) {
        std::size_t count = 0;
        ForEachRecord(*f.pool, [&](void* p, unsigned its) {
          if (its == 0 || *static_cast<Byte*>(p) == its) ++count;
        });
        EXPECT_TRUE(count == live.size() && f.IsSound());
        step % 2000 == 1999 ? f.pool->Clear() : void(f.pool->Reset());
        live.clear();
      }
    }
    EXPECT_GT(f.pool->GetStats().peakBytesHeld, 39600U);
    f.pool->Clear();
    EXPECT_EQ(f.Lines(), "");
  }
}

// Each allocation of an Alloc fails in turn, with and without a new-handler that uses the pool.
TEST(Checked, WithstandsAFailingHeap) {
  static Fixture* failing;
  static unsigned numFailures = 0;
  void (*const handlers[])() = {
      nullptr, [] { failing->pool->Clear(); },
      [] { failing->pool->Reset(), failing->pool->Free(failing->Alloc(8)); }};
  for (const auto handler : handlers)
    for (const unsigned size : {8U, 100U})
      for (unsigned call = 1; call <= 5; ++call) {
        ArenaHeap heap;
        const ArenaHeap::Use use;
        Fixture f;
        failing = &f;
        const Stats before = f.pool->GetStats();
        heap.FailAt(call);
        std::set_new_handler(handler);
        try {
          EXPECT_EQ(f.pool->GetSize(f.Alloc(size)), size);
        } catch (const std::bad_alloc&) {
          ++numFailures;
          EXPECT_EQ(f.pool->GetStats().bytesHeld, before.bytesHeld);
        }
        std::set_new_handler(nullptr);
        heap.FailAt(0);
        EXPECT_TRUE(f.IsSound());
        f.pool->Clear();
        EXPECT_EQ(f.Lines(), "");
        EXPECT_EQ(heap.faults, std::vector<std::string>());
      }
  EXPECT_EQ(numFailures, 7U);
}

} // namespace
