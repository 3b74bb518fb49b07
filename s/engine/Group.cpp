// Construction and release of buckets, and the two lists: the slow paths of a Group.
// Test: tests/model_test.cpp.
#include "engine/Group.h"

#include "engine/Budget.h"

#include <cassert>
#include <memory>

namespace VOK::MemPool {

namespace {

struct DestroyBucket {
  void operator()(Bucket* b) const noexcept { Bucket::Destroy(b); }
};

} // namespace

Group::Group(BucketMgr* owner_, std::uint16_t dataSize_)
    : owner(owner_), dataSize(dataSize_),
      totalRecs(
          static_cast<std::uint16_t>((owner_->bucketSize - 2) / (dataSize_ + recHeaderSize))) {}

// At the limit the pool asks the program, and out of memory the heap runs its new-handler. Either
// may clear the pool and with it destroy this Group, or free a record of it: the request goes on in
// the Group that the pool has afterwards.
VOK_NOINLINE void* Group::AllocFromNewBucket() {
  BucketMgr* const pool = owner;
  Budget& budget = BudgetOf(*pool);
  const std::uint16_t size = dataSize;
  const std::uint64_t bytes = BlockSize();
  while (!budget.Admits(bytes)) {
    budget.AskFor(bytes, *pool->mgr);
    Group* const group = pool->GroupFor(size);
    if (group->head2 != nullptr) return group->Alloc();
  }
  Budget::Room room(budget, bytes);
  std::unique_ptr<Bucket, DestroyBucket> b(Bucket::Create(nullptr, pool->bucketSize, size));
  Group* const group = pool->GroupFor(size);
  b->parent = group;
  room.Fill();
  ++budget.buckets;
  budget.newest = b.get();
  group->Link(b.release());
  return group->Alloc();
}

VOK_NOINLINE void* Group::UnlinkFull(Bucket* b, void* p) {
  UnlinkFree(b);
  return p;
}

VOK_NOINLINE bool Group::LinkRefilled(Bucket* b) {
  LinkFree(b);
  return true;
}

VOK_NOINLINE bool Group::ReleaseEmptied(Bucket* b) {
  const bool wasFull = b->freeRecs == 1; // then it is on the first list alone
  if (owner->keepEmptyBuckets) {
    if (wasFull) LinkFree(b);
    return true;
  }
  UnlinkAll(b);
  if (!wasFull) UnlinkFree(b);
  Budget& budget = BudgetOf(*owner);
  budget.Remove(BlockSize());
  --budget.buckets;
  Bucket::Destroy(b);
  return true;
}

bool Group::Free(void* p, Bucket* bucket) {
  if (bucket == nullptr) bucket = Bucket::FromData(p);
  if (bucket == nullptr || bucket->parent != this) return false;
  // In numbers, since the compiler may take it for granted that no difference of a pointer is null.
  if (reinterpret_cast<std::uintptr_t>(p) <= sizeof(Rec)) return false;
  return TakeBack(p, bucket);
}

void Group::Clear() noexcept {
  for (Bucket* b = head1; b != nullptr;) {
    Bucket* const next = b->next1;
    Bucket::Destroy(b);
    b = next;
  }
  head1 = head2 = nullptr;
  numBuckets = numFreeBuckets = 0;
}

// The Group knows the sizes, so that a damaged header neither leads out of its block nor stays.
void Group::Reset() noexcept {
  const std::uint32_t stride = dataSize + recHeaderSize;
  for (Bucket* b = head1; b != nullptr; b = b->next1) {
    b->recSize = static_cast<std::uint16_t>(stride);
    b->recsSize = static_cast<std::uint16_t>(2 + totalRecs * stride);
    b->Carve();
    b->next2 = b->next1;
    b->prev2 = b->prev1;
  }
  head2 = head1;
  numFreeBuckets = numBuckets;
}

void Group::Link(Bucket* b) {
  assert(b->freeRecs == totalRecs);
  ++numBuckets;
  b->next1 = head1;
  if (head1 != nullptr) head1->prev1 = b;
  head1 = b;
  if (tail1 == nullptr) tail1 = b;
  LinkFree(b);
}

void Group::LinkFree(Bucket* b) {
  ++numFreeBuckets;
  b->next2 = head2;
  if (head2 != nullptr) head2->prev2 = b;
  head2 = b;
}

void Group::UnlinkFree(Bucket* b) {
  --numFreeBuckets;
  Bucket* const prev = b->prev2;
  Bucket* const next = b->next2;
  (prev != nullptr ? prev->next2 : head2) = next;
  if (next != nullptr) next->prev2 = prev;
}

void Group::UnlinkAll(Bucket* b) {
  --numBuckets;
  Bucket* const prev = b->prev1;
  Bucket* const next = b->next1;
  (prev != nullptr ? prev->next1 : head1) = next;
  (next != nullptr ? next->prev1 : tail1) = prev;
}

} // namespace VOK::MemPool
