// The lines of trace and messages: their text against insertions into the same stream, and what
// they change of the stream, its buffer and the heap. The preset tsan runs the cases with threads.
#include "support/Pools.h"

#include "base/PointerText.h"
#include "diagnostics/ReportText.h"
#include "engine/Bucket.h"
#include "services/Messages.h"
#include "services/OutputLine.h"
#include "services/Trace.h"

#include <iomanip>
#include <random>
#include <thread>

namespace {

using namespace VOK::MemPool;

TEST(OutputLine, HasTheTextOfInsertions) {
  std::mt19937_64 random;
  for (const char* const sizes : {"", "\1", "\3\2", "\2\377", "\3"})
    for (const int width : {0, 5, 50, 300})
      for (int i = 0; i < 2000; ++i) {
        const std::uint64_t number = random() >> random() % 64; // of any length
        std::ostringstream line;
        std::ostringstream expected;
        line.imbue(Grouping(sizes));
        line.flags(std::ios::fmtflags(random() % 0x8000));
        line << std::setfill('*') << std::setw(width);
        expected.copyfmt(line);
        OutputLine output(line);
        output << "text" << number;
        (output.Width(width) << number << "end").End();
        expected << "text" << number << std::setw(width) << number << "end\n";
        EXPECT_EQ(line.str(), expected.str());

        // An address is as the platform writes it in the classic locale.
        const auto* const p = reinterpret_cast<const void*>(static_cast<std::uintptr_t>(number));
        std::ostringstream address;
        address << std::setw(8) << p;
        EXPECT_EQ(PtrText(p), address.str());
        address.str("");
        address << std::hex << p;
        EXPECT_EQ(BarePtrText(p).text, address.str().substr(address.str().starts_with("0x") * 2));
      }
}

#ifndef __SANITIZE_THREAD__ // which leaves no place for the arena
// And a line that can't be written hides no failure to load.
TEST_F(Pools, LinesChangeNothingButAPendingWidth) {
  for (const bool dies : {false, true}) {
    std::ostringstream tied;
    Output tiedOutput(tied);
    Output output;
    Output errors(std::cerr);
    const std::locale locale = Grouping();
    std::cout.imbue(locale);
    EXPECT_EQ(output.Text(), "imbued");
    std::cout << std::hex << std::setfill('*') << std::setw(9);
    std::cout.tie(&tied);
    const std::ios::fmtflags flags = std::cout.flags();
    dead = dies;
    const ArenaHeap::Use use;
    EXPECT_NO_THROW(Trace::Freed(nullptr, nullptr));
    EXPECT_NO_THROW(Messages::Warning({0x123u}, 0xABC));
    EXPECT_THROW(Messages::RefuseLoad({"reason ", 7u}), const char*);
    dead = false;
    const ArenaHeap::Use real(false);
    EXPECT_TRUE(heap.events.empty());
    EXPECT_EQ(output.Text(), dies ? "" : "****zvpt:f:0:0:\nWARNING:../s/MemPool:a.b.c: 1.2.3\n");
    EXPECT_THAT(errors.Text(), testing::EndsWith(dies ? "" : ": reason 7\n"));
    EXPECT_EQ(tiedOutput.numFlushes, 2u);
    EXPECT_TRUE(std::cout.good() && std::cout.flags() == flags && std::cout.width() == 0 &&
                std::cout.fill() == '*' && std::cout.getloc() == locale && tied.good());
  }
}
#endif

TEST(Threads, SwitchTrace) {
  const KeepSettings settings{};
  const auto work = [](bool on) {
    for (int i = 0; i < 5000; ++i)
      ZOR_VOK_MEMPOOL_TRACE(on != ZOR_VOK_MEMPOOL_TRACE());
  };
  std::thread other(work, false);
  work(true);
  other.join();
  EXPECT_EQ(Observers::Watching(), ZOR_VOK_MEMPOOL_TRACE() || Observers::Present());
}

TEST(Threads, WriteWholeLinesWithAPoolEach) {
  const KeepSettings settings{};
  Set("on=1 bucket=26 max=8 trace=1"); // three records in a bucket
  const auto work = [](Mgr& pool) {
    const Observers::Quiet looking; // into headers
    for (int i = 0; i < 100; ++i) {
      void* const p = pool.Alloc(4);
      Bucket* const bucket = Bucket::FromData(p);
      bucket->RecAt(bucket->freeHead)->SetOffset(bucket->freeHead); // a circle: the report warns
      std::ostringstream report;
      bucket->Dbg(report, 1, 0, false, true);
      pool.Free(p);
    }
  };
  Mgr first;
  Mgr second;
  testing::internal::CaptureStdout();
  std::thread other(work, std::ref(second));
  work(first);
  other.join();
  std::istringstream lines(testing::internal::GetCapturedStdout());
  int numWhole = 0;
  for (std::string line; std::getline(lines, line);)
    if (line.find_first_not_of("zvpt:0123456789abcdef") == std::string::npos ||
        (line.starts_with("WARNING:") && line.ends_with(" recs 4 > 3")))
      ++numWhole;
  EXPECT_EQ(numWhole, 2 * 3 * 100);
}

} // namespace
