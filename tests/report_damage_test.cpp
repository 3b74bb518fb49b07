#include "support/Reports.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Group.h"

#include <algorithm>
#include <iostream>
#include <regex>
#include <sstream>
#include <streambuf>

using namespace VOK::MemPool;

namespace {

class ReportDamage : public Reports {
protected:
  Bucket* bucket = nullptr; // of ten records; those at 2, 34 and 66 are used, the chain is 50 18 82
  std::uint8_t* bytes = nullptr;
  std::string whole;

  void SetUp() override {
    Reports::SetUp();
    Mgr& pool = Make("damaged", "bucket=162 max=16");
    const std::vector<void*> records = Alloc(pool, 5, 12);
    pool.Free(records[1]);
    pool.Free(records[3]);
    bucket = Bucket::FromData(records[0]);
    bytes = reinterpret_cast<std::uint8_t*>(bucket);
    ArenaHeap::Open(bytes, recsBaseOffset + bucket->recsSize);
    whole.assign(bytes, bytes + recsBaseOffset + bucket->recsSize);
  }
  void TearDown() override {
    std::copy(whole.begin(), whole.end(), bytes);
    Reports::TearDown();
  }

  void DbgPool(std::ostream& os) const { bucket->parent->owner->Dbg(os, 0, true, true, true); }

  /// Damages fields of the bucket and of the records at an offset: "recSize=15 next18=50 type2=3".
  void Damage(const std::string& text) const {
    static const std::map<std::string, std::uint16_t Bucket::*> fields = {
        {"recsSize", &Bucket::recsSize},
        {"recSize", &Bucket::recSize},
        {"freeHead", &Bucket::freeHead},
        {"freeRecs", &Bucket::freeRecs}};
    std::istringstream words(text);
    for (std::string word; words >> word;) {
      const std::size_t equals = word.find('=');
      const std::string field = word.substr(0, equals);
      const auto value = static_cast<std::uint16_t>(std::stoul(word.substr(equals + 1)));
      if (field.starts_with("next"))
        bucket->RecAt(static_cast<unsigned>(std::stoul(field.substr(4))))->SetOffset(value);
      else if (field.starts_with("type"))
        bytes[recsBaseOffset + std::stoul(field.substr(4)) + 2] = static_cast<std::uint8_t>(value);
      else
        bucket->*fields.at(field) = value;
    }
  }
};

// They stand below the row that set them off, on standard output wherever the report goes.
TEST_F(ReportDamage, Warnings) {
  Damage("recSize=15 next18=50");
  const std::string text = Report([&] { bucket->Dbg(std::cout, 1, 1, true, true); });
  ExpectGolden("warnings", text);

  std::ostringstream os;
  const std::string warnings = Report([&] {
    const ArenaHeap::Use real(false);
    os.str("");
    bucket->Dbg(os, 1, 1, true, true);
  });
  EXPECT_EQ(warnings, "WARNING:../s/MemPool:#####: Did not reach the expected number of recs "
                      "11 < 10\n"
                      "WARNING:../s/MemPool:#####: Exceeded the number of total number of recs "
                      "11 > 10\n");
  EXPECT_EQ(Changes(os.str(), text), std::regex_replace(warnings, std::regex("WARN"), "+WARN"));
}

// The golden file shows what each damage changes in the detailed report of the pool.
TEST_F(ReportDamage, Fields) {
  std::string changes;
  const auto report = [&] { return Report([&] { DbgPool(std::cout); }); };
  const std::string before = report();
  for (const char* damage : {"recSize=0",         "recSize=3 recsSize=11",
                             "recSize=160",       "recSize=161",
                             "recSize=65535",     "recsSize=1",
                             "recsSize=2",        "recsSize=4",
                             "recsSize=5",        "recsSize=161",
                             "recsSize=150",      "recsSize=149",
                             "freeRecs=0",        "freeRecs=10",
                             "freeRecs=11",       "freeHead=0",
                             "freeHead=1",        "freeHead=158 next158=0",
                             "freeHead=159",      "next18=1",
                             "next18=159",        "next18=65535",
                             "next50=50",         "next146=50",
                             "next146=2 next2=0", "type18=1",
                             "type34=0",          "type2=2 type18=3 type50=255"}) {
    Damage(damage);
    changes += std::string("== ") + damage + "\n" + Changes(before, report());
    std::copy(whole.begin(), whole.end(), bytes);
  }
  ExpectGolden("damages", changes);
}

// Counts the lines that it gets.
struct Counter : std::streambuf {
  unsigned lines = 0;
  unsigned flushes = 0;

  int_type overflow(int_type c) override {
    if (c == '\n') ++lines;
    return c;
  }
  int sync() override { return ++flushes, 0; }
  std::streamsize xsputn(const char* text, std::streamsize length) override {
    lines += static_cast<unsigned>(std::count(text, text + length, '\n'));
    return length;
  }
};

// Every value of each byte that is no link of the bucket: all walks end and stay in the block,
// which the address sanitizer watches, and write nothing into it. Each line is flushed.
TEST_F(ReportDamage, EachByte) {
  Counter counter;
  std::ostream os(&counter);
  const auto tryAll = [&](std::size_t place) {
    const std::uint8_t right = bytes[place];
    // Nothing in a bucket tells how large its block is, so its area only shrinks.
    const bool isArea = place / 2 == offsetof(Bucket, recsSize) / 2;
    for (unsigned value = 0; value < (isArea ? right : 256u); ++value) {
      bytes[place] = static_cast<std::uint8_t>(value);
      const std::string damaged(bytes, bytes + whole.size());
      counter.lines = counter.flushes = 0;
      DbgPool(os);
      if (counter.lines == counter.flushes && counter.lines < 600 &&
          damaged == std::string(bytes, bytes + whole.size()))
        continue;
      ADD_FAILURE() << "byte " << place << ", value " << value << ", lines " << counter.lines;
    }
    bytes[place] = right;
  };
  for (std::size_t place = offsetof(Bucket, recsSize); place < sizeof(Bucket); ++place)
    tryAll(place);
  for (std::size_t record = sizeof(Bucket); record < whole.size(); record += bucket->recSize)
    for (std::size_t place = record; place < record + sizeof(Rec); ++place)
      tryAll(place);
}

} // namespace
