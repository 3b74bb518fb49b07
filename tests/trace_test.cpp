#include "support/Script.h"

#include "diagnostics/ReportText.h"
#include "services/Trace.h"

#include <gtest/gtest.h>
#include <iomanip>
#include <iostream>
#include <optional>
#include <sstream>

using namespace VOK::MemPool;

namespace {

// The four lines, and among the heap's events each one's place.
TEST(Trace, LinesInTheirPlaces) {
  Expect(R"(
set on=1 trace=1; heap
pool a : +Mgr +BucketMgr | +[<996|1992>] +std
  |zvpt:c:{a}
alloc a zero 0 -> #1+2 : +Group +[<4036|4056>] |
  |zvpt:a:{a}:{zero}:0
alloc a p 10 -> #2+2 : +Group +[<4028|4048>] |
  |zvpt:a:{a}:{p}:10
alloc a e 2000 -> ext : +[<2016|2024>] |
  |zvpt:a:{a}:{e}:2000
free a p -> true : | -[<4028|4048>]
  |zvpt:f:{a}:{p}:
free a e -> true : | -[<2016|2024>]
  |zvpt:f:{a}:{e}:
free a zero+2 -> false : |
  |zvpt:f:{a}:{?}:
free a null -> false
alloc a q 10 -> #3+2 : +[<4028|4048>] |
  |zvpt:a:{a}:{q}:10
alloc a f 997 -> ext : +[<1013|1021>] |
  |zvpt:a:{a}:{f}:997
size a q -> 12; has a q -> true; gc a -> false
clear a : -[<1013|1021>] -[<4036|4056>] -Group -[<4028|4048>] -Group
alloc a max 0x3FFFFFFF -> bad_alloc : ![<1073741839|1073741847>]
alloc a q 10 -> #4+2 : +Group +[<4028|4048>] |
  |zvpt:a:{a}:{q}:10
alloc a f 997 -> ext : +[<1013|1021>] |
  |zvpt:a:{a}:{f}:997
drop a : -std | -[<1013|1021>] -[<4028|4048>] -Group -[<996|1992>] -BucketMgr -Mgr
  |zvpt:d:{a}
set on=0
pool b : +Mgr +BucketMgr | +[<996|1992>] +std
  |zvpt:c:{b}
alloc b p 10 -> heap : +[10] |
  |zvpt:a:{b}:{p}:10
free b p -> true : | -[10]
  |zvpt:f:{b}:{p}:
clear b
drop b : -std | -[<996|1992>] -BucketMgr -Mgr
  |zvpt:d:{b}
)");
}

// The switch counts at each event, for pools old and new.
TEST(Trace, SwitchedInLife) {
  Expect(R"(
set on=1; pool a; alloc a p 10 -> #1+2; set trace=1
alloc a q 10 -> #1+18
  |zvpt:a:{a}:{q}:10
free a p -> true
  |zvpt:f:{a}:{p}:
set trace=0; free a q -> true; pool b; set trace=1
drop b
  |zvpt:d:{b}
set trace=0; drop a
)");
}

// Addresses in full, and a stream whose state is its own.
TEST(Trace, Text) {
  Expect(R"(
set on=1 trace=1; raw
pool a
  |zvpt:c:<20000030|200000000030>
alloc a p 10 -> #1+2
  |zvpt:a:<20000030|200000000030>:<20000510|200000000954>:10
free a p -> true
  |zvpt:f:<20000030|200000000030>:<20000510|200000000954>:
hex
alloc a p 30 -> #2+2
  |zvpt:a:<20000030|200000000030>:<20000510|200000000954>:0X1E
free a p -> true
  |zvpt:f:<20000030|200000000030>:<20000510|200000000954>:
drop a
  |zvpt:d:<20000030|200000000030>
)");
}

// A line that can't be written is lost, and the operation that it tells of goes on, also where the
// program has told the stream to throw.
TEST(Trace, ADeadStreamStopsNothing) {
  struct : std::streambuf {
  } dead;
  std::streambuf* const before = std::cout.rdbuf(&dead);
  std::cout.exceptions(std::ios::badbit | std::ios::failbit);
  ZOR_VOK_MEMPOOL_ON(true);
  ZOR_VOK_MEMPOOL_TRACE(true);
  EXPECT_NO_THROW({
    Mgr pool("dead");
    void* const p = pool.Alloc(10);
    EXPECT_TRUE(pool.Contains(p));
    EXPECT_TRUE(pool.Free(p));
  });
  ZOR_VOK_MEMPOOL_TRACE(false);
  ZOR_VOK_MEMPOOL_ON(false);
  EXPECT_TRUE(std::cout.good());
  std::cout.exceptions(std::ios::goodbit);
  std::cout.rdbuf(before);
}

// What a private stream of the platform writes in the classic locale: in a trace line without a
// leading 0x, in a report under width 8.
TEST(Trace, PointersAreTheStreams) {
  std::vector<std::uintptr_t> values{0, 1, 0xF, 0x10, 0x0AB0, 0xABCDEF, 0x12345678, UINTPTR_MAX};
  for (unsigned bit = 0; bit < 8 * sizeof(void*); ++bit)
    values.push_back(std::uintptr_t{1} << bit);
  for (const bool grouping : {false, true}) {
    std::optional<GroupingLocale> locale;
    if (grouping) locale.emplace();
    for (const std::uintptr_t value : values) {
      const auto* const p = reinterpret_cast<const void*>(value);
      std::stringstream stream;
      stream.imbue(std::locale::classic());
      stream << std::hex << p;
      const std::string text = stream.str();
      EXPECT_EQ(BarePtrText(p).text, text.substr(text.starts_with("0x") ? 2 : 0))
          << "grouping " << grouping;
      stream.str("");
      stream << std::setw(8) << p;
      EXPECT_EQ(PtrText(p), stream.str()) << "grouping " << grouping;
    }
  }
}

} // namespace
