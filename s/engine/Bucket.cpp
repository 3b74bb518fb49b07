// Construction and destruction of a bucket, and the way back from a pointer.
// Test: tests/bucketmgr_test.cpp, tests/model_test.cpp.
#include "engine/Bucket.h"

#include "base/KeepStores.h"

#include <cassert>
#include <new>

namespace VOK::MemPool {

Bucket* Bucket::Create(Group* parent, std::uint32_t bucketSize, std::uint16_t dataSize) {
  assert(dataSize + 2 * recHeaderSize <= bucketSize && bucketSize <= maxBucketSize);
  const std::uint32_t stride = dataSize + recHeaderSize;
  const std::uint32_t size = 2 + (bucketSize - 2) / stride * stride;
  auto* const b = static_cast<Bucket*>(::operator new[](recsBaseOffset + size));
  b->parent = parent;
  b->next1 = b->prev1 = b->next2 = b->prev2 = nullptr;
  b->recsSize = static_cast<std::uint16_t>(size);
  b->recSize = static_cast<std::uint16_t>(stride);
  b->Carve();
  return b;
}

void Bucket::Carve() {
  const std::uint32_t stride = recSize;
  const std::uint32_t last = recsSize - stride;
  freeHead = 2;
  freeRecs = static_cast<std::uint16_t>(TotalRecs());
  const auto carve = [this](std::uint32_t offset, std::uint32_t next) {
    Rec* const rec = RecAt(offset);
    rec->SetOffset(static_cast<std::uint16_t>(next));
    rec->type = RecType::Free;
  };
  for (std::uint32_t offset = 2; offset < last; offset += stride)
    carve(offset, offset + stride);
  carve(last, 0);
}

// A stray pointer may have a poisoned record before it: an instrumented build must not check these
// reads.
__attribute__((no_sanitize_address)) Bucket* Bucket::FromData(const void* p) {
  if (p == nullptr) return nullptr;
  const Rec* const rec = Rec::FromData(p);
  if (rec->type != RecType::Used || rec->Offset() < 2) return nullptr;
  Bucket* const bucket = OfUsed(rec);
  if (bucket == nullptr || bucket->parent == nullptr || bucket->recsSize == 0) return nullptr;
  return bucket;
}

void Bucket::Destroy(Bucket* b) noexcept {
  if (b == nullptr || b->recSize == 0) return;
  b->parent = nullptr;
  b->next1 = b->prev1 = b->next2 = b->prev2 = nullptr;
  b->recsSize = 0;
  b->recSize = 0;
  KeepStores(b);
  ::operator delete[](b);
}

} // namespace VOK::MemPool
