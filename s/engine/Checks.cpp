// The operations of a checked pool, and what they test.
// Test: tests/checked_test.cpp.
#include "engine/Checks.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/Group.h"
#include "services/Messages.h"

#include <cstring>
#include <new>
#include <utility>

namespace VOK::MemPool {

namespace {

constexpr std::uint8_t guardByte = 0xB9;
constexpr std::uint8_t freedByte = 0xF5;
constexpr std::size_t maxLinesInUse = 10;

bool IsFilled(const void* from, std::size_t size, std::uint8_t byte) {
  const auto* const bytes = static_cast<const std::uint8_t*>(from);
  return bytes[0] == byte && std::memcmp(bytes, bytes + 1, size - 1) == 0;
}

/// A node that no operation on the map has, the spare one if it is there.
template <class Map>
typename Map::node_type TakeNode(typename Map::node_type& spare) {
  if (!spare.empty()) return std::exchange(spare, {});
  Map made;
  made.try_emplace(nullptr);
  return made.extract(made.begin());
}

} // namespace

Checks::Checks(BucketMgr& pool_, bool endsAtFinding_, const Options& options)
    : pool(pool_), heldBack(options.heldBack), endsAtFinding(endsAtFinding_),
      atFinding(options.atFinding), context(options.findingContext) {}

Checks::~Checks() {
  TestAll();
  std::size_t inUse = 0;
  for (const auto& [p, record] : records)
    if (record.state == State::Used)
      Report(Finding::Kind::StillInUse, p, &record, ++inUse <= maxLinesInUse);
  if (inUse > maxLinesInUse)
    Messages::Warning({"Pool '", pool.name.c_str(), "': ", inUse - maxLinesInUse,
                       " more still in use at the end"});
}

void* Checks::Alloc(std::uint32_t size) {
  while (true) {
    auto recordNode = TakeNode<Records>(spareRecord);
    auto homeNode = TakeNode<Homes>(spareHome);
    TestFreeList(size + guardSize);
    void* const p = AllocPooled(size + guardSize);

    Homes::value_type* home = nullptr;
    if (Bucket* const bucket = Bucket::FromData(p)) {
      homeNode.key() = bucket;
      auto place = homes.insert(std::move(homeNode));
      home = &*place.position;
      if (place.inserted) Adopt(*home);
      ++home->second.busy;
      homeNode = std::move(place.node);
    }
    if (!homeNode.empty()) spareHome = std::move(homeNode);
    recordNode.key() = p;
    auto place = records.insert(std::move(recordNode));
    if (!place.inserted) spareRecord = std::move(place.node);
    Record& record = place.position->second;
    record.home = home; // an entry is Free as it comes
    if (home != nullptr && !DataIsSound(*place.position)) {
      record.state = State::Retired;
      Report(Finding::Kind::WriteAfterFree, p, &record);
      continue;
    }
    record = {home, size, State::Used, ++numRequests, nullptr};
    std::memset(static_cast<std::uint8_t*>(p) + size, guardByte, CapacityOf(record) - size);
    return p;
  }
}

/// Out of memory or at its limit, the pool serves once more without the records held back.
void* Checks::AllocPooled(std::uint32_t size) {
  try {
    return pool.AllocPooled(size);
  } catch (const std::bad_alloc&) {
    if (numHeld == 0) throw;
  }
  while (numHeld > 0)
    ReleaseOldest();
  return pool.AllocPooled(size);
}

void Checks::Adopt(Homes::value_type& home) {
  auto& [bucket, entry] = home;
  entry = {bucket->parent, 0};
  ForEachRecord(*bucket, [b = bucket, &group = *bucket->parent](std::uint32_t offset) {
    std::memset(b->RecAt(offset)->Data(), freedByte, group.dataSize);
  });
}

/// Tests the bucket that serves the next request of that size, and its record.
void Checks::TestFreeList(std::uint32_t size) {
  const Group* const group = pool.FindGroup(size);
  if (group == nullptr || group->head2 == nullptr) return;
  const auto home = homes.find(group->head2);
  Bucket* const bucket = home->first;
  if (!IsSound(*home)) {
    Mend(*home);
    Report(Finding::Kind::DamagedHeader, bucket, nullptr);
  } else if (!FreeListIsSound(*home)) {
    void* const p = bucket->RecAt(bucket->freeHead)->Data();
    const auto last = records.find(p);
    Mend(*home);
    Report(Finding::Kind::BrokenFreeList, p, last != records.end() ? &last->second : nullptr);
  }
}

bool Checks::Free(void* p) noexcept {
  const auto entry = records.find(p);
  if (entry == records.end()) {
    Report(Finding::Kind::StrayFree, p, nullptr);
    return false;
  }
  if (entry->second.state != State::Used) {
    Report(Finding::Kind::SecondFree, p, &entry->second);
    return false;
  }
  if (Passes(*entry)) HoldBack(*entry);
  return true;
}

void Checks::HoldBack(Records::value_type& entry) {
  auto& [p, record] = entry;
  record.state = State::Held;
  std::memset(p, freedByte, CapacityOf(record));
  (numHeld == 0 ? oldestHeld : newestHeld->second.heldNext) = &entry;
  newestHeld = &entry;
  if (++numHeld > heldBack) ReleaseOldest();
}

void Checks::ReleaseOldest() {
  Records::value_type& entry = *oldestHeld;
  oldestHeld = entry.second.heldNext;
  --numHeld;
  if (!Passes(entry)) return;
  entry.second.state = State::Free;
  void* const p = entry.first; // the entry goes before the record
  Homes::value_type* const home = entry.second.home;
  if (home == nullptr)
    records.erase(p);
  else if (--home->second.busy == 0 && !pool.keepEmptyBuckets)
    Forget(home->first);
  pool.FreePooled(p);
}

/// The bucket returns to the heap next.
void Checks::Forget(Bucket* bucket) {
  const auto from = records.lower_bound(bucket);
  auto to = from;
  for (; to != records.end() && to->second.home != nullptr && to->second.home->first == bucket;
       ++to)
    Passes(*to);
  records.erase(from, to);
  homes.erase(bucket);
}

void Checks::Clear() noexcept {
  TestAll();
  pool.Clear();
  records.clear();
  homes.clear();
  numHeld = 0;
}

bool Checks::Reset() noexcept {
  TestAll();
  pool.Reset();
  records.clear();
  for (Homes::value_type& home : homes)
    Adopt(home);
  numHeld = 0;
  return true;
}

bool Checks::Contains(const void* p) const {
  const auto entry = records.find(const_cast<void*>(p));
  return entry != records.end() && entry->second.state == State::Used;
}

std::uint32_t Checks::GetSize(const void* p) const {
  return Contains(p) ? records.find(const_cast<void*>(p))->second.size : 0;
}

std::uint32_t Checks::CapacityOf(const Record& record) {
  return record.home != nullptr ? record.home->second.group->dataSize : record.size + guardSize;
}

bool Checks::DataIsSound(const Records::value_type& entry) const {
  const auto& [p, record] = entry;
  const std::uint32_t capacity = CapacityOf(record);
  if (record.state != State::Used) return IsFilled(p, capacity, freedByte);
  return IsFilled(static_cast<const std::uint8_t*>(p) + record.size, capacity - record.size,
                  guardByte);
}

/// Tests a record; one that doesn't pass is reported, mended and retired.
bool Checks::Passes(Records::value_type& entry) {
  auto& [p, record] = entry;
  if (record.state == State::Retired) return false;
  const bool isUsed = record.state == State::Used;
  if (record.state != State::Free && !HeaderIsSound(entry)) {
    Mend(entry);
    record.state = State::Retired;
    Report(Finding::Kind::DamagedHeader, p, &record);
    return false;
  }
  if (DataIsSound(entry)) return true;
  if (record.state != State::Free) record.state = State::Retired;
  Report(isUsed ? Finding::Kind::Overrun : Finding::Kind::WriteAfterFree, p, &record);
  return false;
}

void Checks::TestAll() {
  for (const Homes::value_type& home : homes)
    if (!IsSound(home)) {
      Mend(home);
      Report(Finding::Kind::DamagedHeader, home.first, nullptr);
    }
  for (Records::value_type& entry : records)
    Passes(entry);
}

} // namespace VOK::MemPool
