// The headers of a checked pool: their proof by its tables, and their mending.
// Test: tests/checked_test.cpp.
#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Checks.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"

#include <new>

namespace VOK::MemPool {

namespace {

ExtRec* ExtRecOf(void* p) { return static_cast<ExtRec*>(p) - 1; }

std::uint32_t StrideOf(const Group& group) { return group.dataSize + recHeaderSize; }

bool IsOffset(const Group& group, std::uint32_t offset) {
  const std::uint32_t stride = StrideOf(group);
  return offset >= 2 && (offset - 2) % stride == 0 && (offset - 2) / stride < group.totalRecs;
}

} // namespace

bool Checks::IsFree(void* p) const {
  const auto entry = records.find(p);
  return entry == records.end() || entry->second.state == State::Free;
}

bool Checks::IsSound(const Homes::value_type& home) const {
  Bucket* const b = home.first;
  const Group& group = *home.second.group;
  if (b->parent != &group || b->recSize != StrideOf(group) ||
      b->recsSize != 2 + group.totalRecs * StrideOf(group) ||
      b->freeRecs != group.totalRecs - home.second.busy ||
      (b->freeRecs == 0 ? b->freeHead != 0 : !IsOffset(group, b->freeHead)))
    return false;
  const auto leadsBack = [&](Bucket* neighbour, Bucket* Bucket::*back, const Bucket* end) {
    return neighbour == nullptr ? end == b : homes.contains(neighbour) && neighbour->*back == b;
  };
  return leadsBack(b->next1, &Bucket::prev1, group.tail1) &&
         leadsBack(b->prev1, &Bucket::next1, group.head1) &&
         (b->freeRecs == 0 || (leadsBack(b->next2, &Bucket::prev2, b) &&
                               leadsBack(b->prev2, &Bucket::next2, group.head2)));
}

/// Whether the record that is served next and the one that it leads to are free.
bool Checks::FreeListIsSound(const Homes::value_type& home) const {
  Bucket* const b = home.first;
  const auto isFree = [&](std::uint32_t offset) {
    Rec* const rec = b->RecAt(offset);
    return rec->type == RecType::Free && IsFree(rec->Data());
  };
  if (!isFree(b->freeHead)) return false;
  const std::uint32_t next = b->RecAt(b->freeHead)->Offset();
  if (b->freeRecs == 1) return next == 0;
  return next != b->freeHead && IsOffset(*home.second.group, next) && isFree(next);
}

bool Checks::HeaderIsSound(const Records::value_type& entry) const {
  const auto& [p, record] = entry;
  if (record.home != nullptr) {
    const Rec* const rec = Rec::FromData(p);
    return rec->type == RecType::Used && rec->Offset() == record.home->first->OffsetOf(rec) &&
           IsSound(*record.home);
  }
  ExtRec* const e = ExtRecOf(p);
  const auto leadsBack = [&](ExtRec* neighbour, ExtRec* ExtRec::*back) {
    if (neighbour == nullptr) return true;
    const auto found = records.find(neighbour + 1);
    return found != records.end() && found->second.home == nullptr && neighbour->*back == e;
  };
  return ExtRec::FromData(p) == e && e->length == record.size + guardSize &&
         leadsBack(e->next, &ExtRec::prev) && leadsBack(e->prev, &ExtRec::next) &&
         (e->prev != nullptr || pool.extRecs == e);
}

/// Writes the header and the free list of a bucket anew, and both lists of its Group.
void Checks::Mend(const Homes::value_type& home) {
  Bucket* const damaged = home.first;
  Group& group = *home.second.group;
  damaged->parent = &group;
  damaged->recSize = static_cast<std::uint16_t>(StrideOf(group));
  damaged->recsSize = static_cast<std::uint16_t>(2 + group.totalRecs * StrideOf(group));
  damaged->freeHead = damaged->freeRecs = 0;
  const auto begin = reinterpret_cast<std::uintptr_t>(damaged->RecsBase());
  ForEachRecord(*damaged, [&](std::uint32_t offset) {
    // In numbers, since the compiler takes the records for a part of the header's last field.
    auto* const rec = reinterpret_cast<Rec*>(begin + offset);
    if (!IsFree(rec->Data())) return;
    rec->SetOffset(static_cast<std::uint16_t>(offset));
    damaged->PushRec(rec->Data());
  });

  group.head1 = group.tail1 = group.head2 = nullptr;
  group.numBuckets = group.numFreeBuckets = 0;
  for (const auto& [b, other] : homes) {
    if (other.group != &group) continue;
    b->prev1 = b->prev2 = nullptr;
    b->next1 = group.head1;
    (group.head1 != nullptr ? group.head1->prev1 : group.tail1) = b;
    group.head1 = b;
    ++group.numBuckets;
    if (b->freeRecs > 0) group.LinkFree(b);
  }
}

/// Writes the header of a record that isn't free anew, and what it leads to.
void Checks::Mend(const Records::value_type& entry) {
  const auto& [p, record] = entry;
  if (record.home != nullptr) {
    Rec* const rec = Rec::FromData(p);
    rec->SetOffset(record.home->first->OffsetOf(rec));
    rec->type = RecType::Used;
    if (!IsSound(*record.home)) Mend(*record.home);
    return;
  }
  new (ExtRecOf(p))
      ExtRec{nullptr, nullptr, record.size + guardSize, 0xAA, 0xBB, RecType::Ext, 0xCC};
  pool.extRecs = nullptr;
  pool.numExtRecs = 0;
  for (const auto& [other, itsRecord] : records) {
    if (itsRecord.home != nullptr) continue;
    ExtRecOf(other)->prev = nullptr;
    ExtRecOf(other)->Link(pool.extRecs, pool.numExtRecs);
  }
}

} // namespace VOK::MemPool
