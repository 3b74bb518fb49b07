#include "support/ArenaHeap.h"

#include "engine/Bucket.h"
#include "engine/ExtRec.h"
#include "services/Observers.h"

#include <algorithm>
#include <cstring>
#include <gtest/gtest.h>
#include <new>
#include <vector>

using namespace VOK::MemPool;

namespace {

constexpr std::size_t P = sizeof(void*);
using Bytes = std::vector<std::uint8_t>;

Group* const parent = reinterpret_cast<Group*>(std::uintptr_t{0x12345678});

Bytes BytesOf(const void* from, std::size_t count) {
  ArenaHeap::Open(from, count);
  const auto* const bytes = static_cast<const std::uint8_t*>(from);
  return {bytes, bytes + count};
}

class BucketTest : public testing::Test {
protected:
  ArenaHeap heap;
  const Observers::Quiet looking; // into headers, which are nobody else's

  // Each bucket of a test is released with it.
  Bucket* Create(std::uint32_t bucketSize, std::uint16_t dataSize) {
    const ArenaHeap::Use use;
    Bucket* const bucket = Bucket::Create(parent, bucketSize, dataSize);
    const ArenaHeap::Use real(false);
    standing.push_back(bucket);
    return bucket;
  }
  void TearDown() override {
    for (Bucket* bucket : standing)
      Bucket::Destroy(bucket);
    for (const std::string& fault : heap.Finish())
      ADD_FAILURE() << fault;
  }

private:
  std::vector<Bucket*> standing;
};

TEST_F(BucketTest, Create) {
  const struct {
    std::uint32_t bucketSize;
    std::uint16_t dataSize;
    unsigned recSize, recsSize, totalRecs;
  } cases[] = {
      {4010, 4, 8, 4010, 501},         {4010, 12, 16, 4002, 250},   {4010, 6, 10, 4002, 400},
      {4010, 7, 11, 4006, 364},        {4011, 4, 8, 4010, 501},     {4009, 4, 8, 4002, 500},
      {4010, 996, 1000, 4002, 4},      {4010, 4002, 4006, 4008, 1}, {9, 1, 5, 7, 1},
      {65535, 65527, 65531, 65533, 1}, {65535, 4, 8, 65530, 8191},  {65535, 1, 5, 65532, 13106}};
  for (const auto& c : cases) {
    const testing::ScopedTrace row(
        __FILE__, __LINE__, std::to_string(c.bucketSize) + ", " + std::to_string(c.dataSize));
    const Bucket* const b = Create(c.bucketSize, c.dataSize);
    EXPECT_EQ(b->recSize, c.recSize);
    EXPECT_EQ(b->recsSize, c.recsSize);
    EXPECT_EQ(b->TotalRecs(), c.totalRecs);
    EXPECT_EQ(b->freeRecs, c.totalRecs);
    EXPECT_EQ(heap.events.back().form, ArenaHeap::Form::Array);
    EXPECT_EQ(heap.events.back().size, 5 * P + 6 + c.recsSize);
    EXPECT_EQ(heap.events.back().block, b);
  }
}

// Three records of stride 16, byte for byte: what no field names is as the heap delivered it.
TEST_F(BucketTest, Layout) {
  Bucket* const b = Create(50, 12);
  Bytes wanted(5 * P + 8 + 3 * 16, ArenaHeap::delivered);
  std::fill_n(wanted.begin(), 5 * P, std::uint8_t{0});
  std::memcpy(wanted.data(), &parent, P);
  const std::uint16_t fields[] = {50, 16, 2, 3};
  std::memcpy(&wanted[5 * P], fields, sizeof fields);
  std::uint8_t* const recs = &wanted[5 * P + 8];
  const auto header = [recs](unsigned k, unsigned offset, unsigned type) {
    const std::uint8_t bytes[] = {static_cast<std::uint8_t>(offset),
                                  static_cast<std::uint8_t>(offset >> 8),
                                  static_cast<std::uint8_t>(type)};
    std::copy_n(bytes, sizeof bytes, recs + k * 16);
  };
  header(0, 18, 0), header(1, 34, 0), header(2, 0, 0);
  EXPECT_EQ(BytesOf(b, wanted.size()), wanted);

  auto* const bytes = reinterpret_cast<std::uint8_t*>(b);
  for (unsigned k = 0; k < 3; ++k)
    EXPECT_EQ(b->PopRec(), bytes + 5 * P + 8 + k * 16 + 4);
  header(0, 2, 1), header(1, 18, 1), header(2, 34, 1);
  std::memset(&wanted[5 * P + 4], 0, 4); // freeHead, freeRecs
  EXPECT_EQ(BytesOf(b, wanted.size()), wanted);

  // Pushed 0, 2, 1: a stack, so that they come back in the order 1, 2, 0.
  for (const unsigned k : {0u, 2u, 1u})
    b->PushRec(bytes + 5 * P + 12 + k * 16);
  header(0, 0, 0), header(2, 2, 0), header(1, 34, 0);
  const std::uint16_t state[] = {18, 3};
  std::memcpy(&wanted[5 * P + 4], state, sizeof state);
  EXPECT_EQ(BytesOf(b, wanted.size()), wanted);
  for (const unsigned k : {1u, 2u, 0u})
    EXPECT_EQ(b->PopRec(), bytes + 5 * P + 12 + k * 16);
}

TEST_F(BucketTest, OwnOffsetIsStoredLowByteFirst) {
  // Of all records popped, the one at 0x1234 and the one whose offset reads as an ExtRec's tag.
  for (const auto& [stride, offset] : {std::pair{34u, 0x1234u}, {40u, 0xBBAAu}}) {
    Bucket* const b = Create(offset + stride, static_cast<std::uint16_t>(stride - 4));
    while (b->freeRecs > 0)
      b->PopRec();
    auto* const p = reinterpret_cast<std::uint8_t*>(b) + 5 * P + 6 + offset + 4;
    EXPECT_EQ(p[-4], offset & 0xFF);
    EXPECT_EQ(p[-3], offset >> 8);
    EXPECT_EQ(p[-2], 1);
    EXPECT_EQ(p[-1], ArenaHeap::delivered);
    p[-1] = 0xCC;
    EXPECT_EQ(Bucket::FromData(p), b);
    EXPECT_EQ(ExtRec::FromData(p), nullptr);
  }
}

TEST_F(BucketTest, FromData) {
  EXPECT_EQ(Bucket::FromData(nullptr), nullptr);
  Bucket* const b = Create(50, 12);
  auto* const p = static_cast<std::uint8_t*>(b->PopRec());
  EXPECT_EQ(Bucket::FromData(p), b);
  EXPECT_EQ(Bucket::FromData(p + 16), nullptr) << "a free record";
  // Bytes 0 to 2 of the header, each kind of change that hides the record.
  const std::uint8_t headers[][3] = {{2, 0, 0},   {2, 0, 2}, {2, 0, 3},
                                     {2, 0, 255}, {0, 0, 1}, {1, 0, 1}};
  for (const auto& header : headers) {
    std::copy_n(header, 3, p - 4);
    EXPECT_EQ(Bucket::FromData(p), nullptr) << int{header[0]} << " type " << int{header[2]};
  }
  const std::uint8_t whole[] = {2, 0, 1};
  std::copy_n(whole, 3, p - 4);
  b->parent = nullptr;
  EXPECT_EQ(Bucket::FromData(p), nullptr) << "no parent";
  b->parent = parent;
  const std::uint16_t recsSize = std::exchange(b->recsSize, std::uint16_t{0});
  EXPECT_EQ(Bucket::FromData(p), nullptr) << "no record area";
  b->recsSize = recsSize;
  EXPECT_EQ(Bucket::FromData(p), b);
}

TEST_F(BucketTest, DestroyScrubsTheHeaderAlone) {
  Bucket* b = nullptr;
  {
    const ArenaHeap::Use use;
    b = Bucket::Create(parent, 50, 12);
  }
  b->PopRec();
  b->next1 = b->prev1 = b->next2 = b->prev2 = b;
  const std::size_t size = 5 * P + 8 + 3 * 16;
  Bytes wanted = BytesOf(b, size);
  std::fill_n(wanted.begin(), 5 * P + 4, std::uint8_t{0}); // up to freeHead
  unsigned numSeen = 0;
  heap.watch = [&](const ArenaHeap::Event& event) {
    ++numSeen;
    EXPECT_EQ(event.form, ArenaHeap::Form::Array);
    EXPECT_EQ(BytesOf(event.block, size), wanted);
  };
  Bucket::Destroy(b);
  EXPECT_EQ(numSeen, 1u);
  Bucket::Destroy(nullptr);
  Bucket scrubbed{};
  Bucket::Destroy(&scrubbed);
}

TEST_F(BucketTest, OutOfMemoryPassesThrough) {
  heap.FailAt(1);
  EXPECT_THROW(Create(4010, 4), std::bad_alloc);
}

TEST_F(BucketTest, ExtRecLayout) {
  ExtRec* const e = ExtRec::Create(300);
  Bytes wanted(2 * P, 0);
  const std::uint32_t length = 300;
  wanted.resize(2 * P + 4);
  std::memcpy(&wanted[2 * P], &length, 4);
  wanted.insert(wanted.end(), {0xAA, 0xBB, 2, 0xCC});
  EXPECT_EQ(BytesOf(e, wanted.size()), wanted);
  auto* const p = static_cast<std::uint8_t*>(e->Data());
  EXPECT_EQ(p, reinterpret_cast<std::uint8_t*>(e) + wanted.size());
  EXPECT_EQ(ExtRec::FromData(p), e);
  EXPECT_EQ(Bucket::FromData(p), nullptr);
  EXPECT_EQ(ExtRec::FromData(nullptr), nullptr);
  for (const int byte : {-4, -3, -2, -1}) {
    ++p[byte];
    EXPECT_EQ(ExtRec::FromData(p), nullptr) << "tag byte " << byte;
    --p[byte];
  }
  for (const std::uint32_t other : {0u, 1u, 0x100u, 0x10000u, 0x1000000u}) {
    e->length = other;
    EXPECT_EQ(ExtRec::FromData(p), other == 0 ? nullptr : e) << "length " << other;
  }
  e->Scrub();
  EXPECT_EQ(BytesOf(e, wanted.size()), Bytes(wanted.size(), 0));
  ExtRec::Destroy(e);
}

// The list c, b, a: which record fits it, and what each Unlink leaves.
TEST_F(BucketTest, ExtRecList) {
  ExtRec a{};
  ExtRec b{};
  ExtRec c{};
  ExtRec foreign{};
  ExtRec* head = nullptr;
  std::uint32_t count = 0;
  EXPECT_FALSE(a.FitsList(head)) << "an empty list";
  for (ExtRec* e : {&a, &b, &c})
    e->Link(head, count);
  EXPECT_EQ(count, 3u);
  EXPECT_TRUE(head == &c && c.next == &b && b.next == &a && a.next == nullptr);
  EXPECT_TRUE(c.prev == nullptr && b.prev == &c && a.prev == &b);
  EXPECT_TRUE(a.FitsList(head) && b.FitsList(head) && c.FitsList(head));
  EXPECT_FALSE(c.FitsList(&foreign)) << "another list's head";
  EXPECT_TRUE(b.FitsList(&foreign)) << "another list's middle can't be told";
  EXPECT_FALSE(b.FitsList(nullptr)) << "a middle, where no list is";
  b.prev = &foreign;
  EXPECT_FALSE(b.FitsList(head)) << "prev that leads elsewhere";
  b.prev = &c;
  a.prev = &foreign;
  EXPECT_FALSE(b.FitsList(head)) << "next that leads elsewhere";
  a.prev = &b;

  b.Unlink(head, count);
  EXPECT_TRUE(head == &c && c.next == &a && a.prev == &c && count == 2) << "the middle";
  a.Unlink(head, count);
  EXPECT_TRUE(head == &c && c.next == nullptr && c.prev == nullptr && count == 1) << "the last";
  ExtRec d{};
  d.Link(head, count);
  d.Unlink(head, count);
  EXPECT_TRUE(head == &c && c.prev == nullptr && count == 1) << "the head";
  c.Unlink(head, count);
  EXPECT_TRUE(head == nullptr && count == 0) << "the only one";
}

} // namespace
