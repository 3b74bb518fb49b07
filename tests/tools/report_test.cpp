#include "Pools.h"

#include "Failure.h"
#include "ReportCheck.h"
#include "ReportJson.h"
#include "ReportReader.h"
#include "ReportSummary.h"
#include "ReportWriter.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <iomanip>
#include <regex>

using namespace VOK::MemPool;
using namespace VOK::MemPool::Tools;
using testing::HasSubstr;
using testing::StartsWith;

namespace {

std::string TextOf(const std::vector<Report>& reports) {
  std::string text;
  for (const Report& report : reports)
    text += WriteReport(report);
  return text;
}

std::string JsonOf(const std::vector<Report>& reports) {
  std::string json;
  WriteJson(reports, [&](std::string_view piece) { json += piece; });
  return json;
}

/// Text to data to text, and by way of JSON; returns the data.
std::vector<Report> RoundTrip(const std::string& text) {
  const std::vector<Report> reports = ReadReports(text);
  EXPECT_EQ(TextOf(reports), text);
  EXPECT_EQ(TextOf(ReadJson(JsonOf(reports))), text);
  return reports;
}

std::string BreachesOf(const std::vector<Report>& reports) {
  std::string text;
  for (const Report& report : reports)
    for (const Breach& breach : CheckReport(report))
      text += std::to_string(breach.line) + ": " + breach.text + "\n";
  return text;
}

std::string ErrorOf(const std::string& text) {
  try {
    ReadReports(text);
  } catch (const Failure& failure) {
    return failure.what();
  }
  return "";
}

std::string Replaced(std::string text, const std::string& from, const std::string& to) {
  const std::size_t at = text.find(from);
  EXPECT_NE(at, text.npos) << from;
  return at == text.npos ? text : text.replace(at, from.size(), to);
}

/// A report in detail: two size classes, full and half full buckets, two ext records.
std::string Sample() {
  PoolSettings{.bucketSize = 162, .maxRecordSize = 100}.Apply();
  WorkedPool pool("sample");
  for (unsigned i = 0; i < 15; ++i)
    pool.Alloc(12);
  for (unsigned i = 0; i < 3; ++i)
    pool.Alloc(30);
  for (const std::size_t i : {1u, 3u, 12u})
    pool.mgr.Free(pool.held[i]);
  pool.Alloc(1500);
  pool.Alloc(2000);
  const Captured captured;
  pool.mgr.DbgDetailed();
  return captured.Get();
}

// Every golden text that is a whole report, of both widths, as a program prints it.
TEST(ReportRoundTrip, Goldens) {
  unsigned count = 0;
  for (const auto& entry : std::filesystem::directory_iterator(VOK_MEMPOOL_GOLDEN "/report")) {
    std::ostringstream golden;
    golden << std::ifstream(entry.path(), std::ios::binary).rdbuf();
    if (!golden.str().starts_with("MemPool::Mgr ")) continue;
    SCOPED_TRACE(entry.path());
    const std::regex place(":../s/MemPool:#####: ");
    RoundTrip(std::regex_replace(golden.str(), place, ":../s/MemPool:  110: "));
    ++count;
  }
  EXPECT_GE(count, 6u);
}

// The library and the reader at each other: whatever the one prints, the other takes, gives back
// and finds sound.
TEST(ReportRoundTrip, RandomPools) {
  Random random(20);
  for (unsigned run = 0; run < 500; ++run) {
    SCOPED_TRACE(run);
    std::vector<std::unique_ptr<WorkedPool>> pools;
    for (unsigned i = 0; i <= run % 3; ++i) {
      PoolSettings settings = PoolSettings::Any(random);
      settings.isOff = random() % 20 == 0;
      settings.Apply();
      pools.push_back(std::make_unique<WorkedPool>("pool " + std::to_string(i)));
      pools.back()->Work(random, random() % 400, settings.maxRecordSize);
      if (random() % 10 == 0 && !settings.isOff) pools.back()->mgr.Clear();
    }
    std::string text;
    {
      const Captured captured;
      run % 2 == 0 ? DbgDetailed() : Dbg();
      text = captured.Get();
    }
    const std::vector<Report> reports = RoundTrip(text);
    EXPECT_EQ(reports.size(), pools.size());
    ASSERT_EQ(BreachesOf(reports), "");
    for (const auto& pool : pools) // blocks of the heap stay with their caller
      for (void* const p : pool->held)
        if (!pool->mgr.IsEnabled()) pool->mgr.Free(p);
  }
}

TEST(ReportRoundTrip, NamesAndLineEnds) {
  for (const std::string name :
       {"", "two\nlines", "caf\xe9", "\xe2\x82\xac", "\"\\\t", "MemPool"}) {
    SCOPED_TRACE(name);
    PoolSettings().Apply();
    const Mgr pool(name.c_str());
    const Captured captured;
    pool.Dbg();
    const std::vector<Report> reports = RoundTrip(captured.Get());
    ASSERT_EQ(reports.size(), 1u);
    EXPECT_EQ(reports[0].name, name);
    EXPECT_EQ(BreachesOf(reports), "");
    RoundTrip(std::regex_replace(captured.Get(), std::regex("\n"), "\r\n"));
  }
}

// Other lines between and around, one of them without its end.
TEST(ReportReader, FindsReportsInAnOutput) {
  const std::string sample = Sample();
  const std::string text =
      "start\nMemPool\n\n" + sample + "zvpt:d:1\n" + sample + "and on: " + sample + "end";
  const std::vector<Report> reports = ReadReports(text);
  ASSERT_EQ(reports.size(), 3u);
  EXPECT_EQ(reports[0].line, 4u);
  EXPECT_EQ(TextOf(reports), sample + sample + sample);
  EXPECT_TRUE(ReadReports("no report\n").empty());
}

// A text that is cut behind or within any line. Where the first bucket's title is not whole yet, it
// is a plain report with something behind it.
TEST(ReportReader, CutReport) {
  const std::string sample = Sample();
  const std::string title = "\n   MemPool::Bucket #";
  const std::size_t plain = sample.find(title);
  for (std::size_t end = sample.find('\n') + 1; end < sample.size(); ++end) {
    if (end >= plain && end < plain + title.size()) continue;
    const std::string cut = sample.substr(0, end);
    ASSERT_THAT(ErrorOf(cut), HasSubstr("expected")) << "cut at " << end;
  }
  EXPECT_THAT(ErrorOf(sample.substr(sample.find('\n') + 1)),
              StartsWith("line 1: expected \"MemPool::Mgr \""));
  EXPECT_THAT(ErrorOf(sample.substr(0, sample.rfind("\n   MemPool::Bucket #003\n"))),
              HasSubstr("found the end of the text"));
}

TEST(ReportReader, OtherStreamStates) {
  const struct {
    const char* name;
    std::ostream& (*set)(std::ostream&);
    const char* line;
  } states[] = {
      {"hex", [](std::ostream& os) -> std::ostream& { return os << std::hex; }, "line 5: "},
      {"oct", [](std::ostream& os) -> std::ostream& { return os << std::oct; }, "line 16: "},
      {"left", [](std::ostream& os) -> std::ostream& { return os << std::left; }, "line 4: "},
      {"fill", [](std::ostream& os) -> std::ostream& { return os << std::setfill('*'); },
       "line 4: "},
      {"boolalpha", [](std::ostream& os) -> std::ostream& { return os << std::boolalpha; },
       "line 15: "},
  };
  for (const auto& state : states) {
    SCOPED_TRACE(state.name);
    PoolSettings().Apply();
    const Mgr pool("state");
    const Captured captured;
    std::cout << state.set;
    pool.Dbg();
    const std::string error = ErrorOf(captured.Get());
    EXPECT_THAT(error, StartsWith(state.line));
    EXPECT_THAT(error, HasSubstr("expected a decimal number up to 4294967295 at the right of 8"));
  }
}

// Each value that the text tells more than once, changed in one place.
TEST(ReportCheck, FindsEachContradiction) {
  const std::string sample = Sample();
  EXPECT_EQ(BreachesOf(ReadReports(sample)), "");
  const struct {
    const char* from;
    const char* to;
    const char* breach;
  } cases[] = {
      {"Num Buckets :        3", "Num Buckets :        4", "7: Num Buckets is 4, not 3"},
      {"Used Recs   :       15", "Used Recs   :       16", "10: Used Recs is 16, not 15"},
      {"Free Recs   :        9", "Free Recs   :        8", "12: Free Recs is 8, not 9"},
      {"   Full     :        0", "   Full     :        1", "9: Full is 1, not 0"},
      {"Num Groups  :       24", "Num Groups  :       25", "6: Num Groups is 25, not 24"},
      {"Sizeof Free :        4", "Sizeof Free :        8", "24: Sizeof Free is 8, not 4"},
      {"HISTOGRAM (4)", "HISTOGRAM (5)", "the title's count is 5, not 4"},
      {"      12        12 *", "      12        13 *", "Freq is 13, not 12"},
      {" *************\n", " ************\n", "the bar is 12, not 13"},
      {"BUCKETS (3)", "BUCKETS (2)", "the title's count is 2, not 3"},
      {"  40.000%", "  40.001%", "% Used in thousandths is 40001, not 40000"},
      {"FREE BUCKETS (3,32)", "FREE BUCKETS (3,31)", "the title's second number is 31, not 32"},
      {"    12     2     0 ", "    16     2     0 ", "Size is 16, not 12"},
      {"EXT RECS (2)", "EXT RECS (1)", "the title's count is 1, not 2"},
      {"   2000 ", "   2001 ", "used records of this size"},
      {"#001 ALL RECORDS (10)", "#001 ALL RECORDS (9)", "the title's count is 9, not 10"},
      {"00003 USED     34", "00003 FREE     34", "FREE LIST lacks the record"},
      {"00003 USED     34", "00003 UNKN     34", "Type is neither FREE nor USED"},
      {"00003 USED     34", "00004 USED     34", "Id is 4, not 3"},
      {"| o=34    ", "| o=36    ", "in the box of offset 34, o is 36, not 34"},
      {"| USED    | FREE +  ", "| USED +  | FREE    ", "\" +\" marks another record"},
      {"   8 | s=16", "   9 | s=16", "the row's label is 9, not 8"},
      {"Used Bytes  :       48", "Used Bytes  :       52", "Used Bytes is 52, not 48"},
      {"Free Head   :       34", "Free Head   :       50", "Offset is 34, not 50"},
      {"00002     82    98", "00002     82   114", "n in the record's box of the map"},
      {"FREE LIST (", "FREE LIST (1", "the title's count"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.from);
    const std::vector<Report> reports = RoundTrip(Replaced(sample, c.from, c.to));
    EXPECT_THAT(BreachesOf(reports), HasSubstr(c.breach));
  }
}

// The bytes in front of a record, damaged under the library: it prints what it finds.
TEST(ReportCheck, DamagedRecords) {
  const unsigned char unknownType[] = {2, 0, 9}; // of the first record
  const unsigned char circle[] = {18, 0, 0};     // a free record that leads to itself
  const struct {
    std::size_t record;
    const unsigned char* header;
    const char* breach;
  } cases[] = {
      {0, unknownType, "Type is neither FREE nor USED"},
      {1, circle, "the library warns of what it found"},
  };
  for (const auto& c : cases) {
    PoolSettings{.bucketSize = 162, .maxRecordSize = 100}.Apply();
    WorkedPool pool("damaged");
    for (unsigned i = 0; i < 3; ++i)
      pool.Alloc(12);
    pool.mgr.Free(pool.held[1]);
    std::memcpy(static_cast<char*>(pool.held[c.record]) - 4, c.header, 3);
    const Captured captured;
    pool.mgr.DbgDetailed();
    EXPECT_THAT(BreachesOf(RoundTrip(captured.Get())), HasSubstr(c.breach));
  }
}

TEST(ReportJson, RefusesOtherDocuments) {
  const std::string json = JsonOf(ReadReports(Sample()));
  const struct {
    const char* from;
    const char* to;
  } cases[] = {
      {"{\"reports\":", "{\"report\":"},    {"\"numGroups\":", "\"numGroup\":"},
      {"\"full\":", "\"full\":-"},          {"\"bar\":", "\"bar\":1000000000"},
      {"\"addr\":\"0x", "\"addr\":\"x"},    {"\"columns\":8", "\"columns\":9"},
      {"\"tag\":\"d\"", "\"tag\":\"dd\""},  {"\"USED\"", "\"used\""},
      {"\"labels\":[0", "\"labels\":[0,0"},
  };
  for (const auto& c : cases)
    EXPECT_THROW(ReadJson(Replaced(json, c.from, c.to)), Failure) << c.from;
}

TEST(ReportSummary, CountsBytes) {
  const std::vector<Report> reports = ReadReports(Sample());
  const bool isWide = sizeof(void*) == 8;
  // Two buckets of 10 records of 16 bytes, one of 4 of 36; 12 of 12 bytes and 3 of 32 are used.
  const unsigned held = 3 * (isWide ? 48 : 28) + 2 * 160 + 144 + 2 * (isWide ? 24 : 16) + 3500;
  EXPECT_THAT(Summarise(reports), HasSubstr(std::to_string(held)));
  EXPECT_THAT(Summarise(reports), HasSubstr(std::to_string(12 * 12 + 3 * 32 + 3500)));
}

} // namespace
