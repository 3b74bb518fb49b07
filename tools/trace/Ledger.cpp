#include "trace/Ledger.h"

#include <algorithm>
#include <bit>

namespace VOK::MemPool::Tools {

TraceLedger::Verdict TraceLedger::Take(LineNumber line, const TraceEvent& event) {
  Verdict verdict;
  ++numEvents;
  switch (event.letter) {
  case 'c':
    End(event.pool, 0); // if it is live, its "d:" is missing
    Begin(event.pool, line);
    ++numMade;
    break;
  case 'd':
    Find(event.pool);
    End(event.pool, line);
    break;
  case 'a':
    Alloc(Find(event.pool), line, event, verdict);
    break;
  default:
    Free(Find(event.pool), line, event, verdict);
    break;
  }
  return verdict;
}

void TraceLedger::TakeMixed(LineNumber line, std::string_view text) {
  constexpr std::size_t shown = 200;
  mixed.Add({line, std::string(text.substr(0, shown))});
}

/// The live pool of that address, which begins here if its construction isn't in the trace.
TraceLedger::LivePool& TraceLedger::Find(std::uint64_t addr) {
  if (recent != nullptr && recent->pool.id.addr == addr) return *recent;
  const auto found = livePools.find(addr);
  recent = found == livePools.end() ? &Begin(addr, 0) : &found->second;
  return *recent;
}

TraceLedger::LivePool& TraceLedger::Begin(std::uint64_t addr, LineNumber line) {
  LivePool& begun = livePools[addr];
  begun.key = ++lastKey;
  begun.pool.id = {line, addr};
  addrByKey[begun.key] = addr;
  return begun;
}

void TraceLedger::End(std::uint64_t addr, LineNumber line) {
  const auto found = livePools.find(addr);
  if (found == livePools.end()) return;
  TracedPool& pool = found->second.pool;
  MarkPeak(pool);
  if (pool.bytesAtPeak > 0) endedSincePeak.emplace_back(pool.id, pool.bytesAtPeak);
  pool.gone = line;
  bytes -= pool.bytes;
  numStale += pool.records + pool.uncertainRecords;
  KeepLeft(found->second);
  gone.Add(pool);
  addrByKey.erase(found->second.key);
  livePools.erase(found);
  recent = nullptr;
  if (numStale > 1000 && numStale > live.GetSize() / 2) DropStale();
}

/// Only the first ones are looked for in the table.
void TraceLedger::KeepLeft(const LivePool& at) {
  const std::uint64_t count = at.pool.records + at.pool.uncertainRecords;
  if (count > 0 && left.items.size() < Kept<Live>::most) {
    std::vector<Live> records;
    for (const LiveRecord& record : live.GetPlaces())
      if (record.line != 0 && record.pool == at.key) records.push_back(LiveOf(record, at.pool));
    std::ranges::sort(records, {}, &Live::line);
    records.resize(std::min(records.size(), Kept<Live>::most - left.items.size()));
    left.items.insert(left.items.end(), records.begin(), records.end());
  }
  left.count += count;
}

TraceLedger::Live TraceLedger::LiveOf(const LiveRecord& record, const TracedPool& pool) {
  return {record.data, pool.id, record.line, record.size, record.line < pool.clearBefore,
          pool.gone};
}

void TraceLedger::Alloc(LivePool& at, LineNumber line, const TraceEvent& event, Verdict& verdict) {
  TracedPool& pool = at.pool;
  LiveRecord& record = live.FindOrAdd(event.data);
  if (record.line != 0) {
    if (TracedPool* const owner = OwnerOf(record)) {
      ProveClear(*owner, record.line, line, verdict);
      --owner->uncertainRecords;
      owner->uncertainBytes -= record.size;
    } else {
      --numStale;
    }
  }
  record = {event.data, line, numEvents, event.size, at.key};
  MarkPeak(pool);
  ++pool.requests;
  ++pool.records;
  pool.bytes += event.size;
  pool.peakBytes = std::max(pool.peakBytes, pool.bytes);
  bytes += event.size;
  ++requestsBySize[event.size];
  if (bytes <= peakBytes) return;
  peakBytes = bytes;
  peakLine = line;
  peakEvent = numEvents;
  ++numPeaks;
  endedSincePeak.clear();
}

void TraceLedger::Free(LivePool& at, LineNumber line, const TraceEvent& event, Verdict& verdict) {
  TracedPool& pool = at.pool;
  LiveRecord* const record = live.Find(event.data);
  const TracedPool* const owner = record == nullptr ? nullptr : OwnerOf(*record);
  if (owner != &pool) {
    refused.Add(
        {line, pool.id, event.data, owner == nullptr ? std::nullopt : std::optional(owner->id)});
    verdict.outcome = Outcome::Refused;
    return;
  }
  ++pool.frees;
  if (record->line < pool.clearBefore) {
    verdict.outcome = Outcome::Uncertain;
    --pool.uncertainRecords;
    pool.uncertainBytes -= record->size;
  } else {
    MarkPeak(pool);
    --pool.records;
    pool.bytes -= record->size;
    bytes -= record->size;
    ++lifetimes[static_cast<std::size_t>(std::bit_width(numEvents - record->event) - 1)];
  }
  live.Remove(*record);
}

/// The pool in which a record lives, null if that has ended.
TracedPool* TraceLedger::OwnerOf(const LiveRecord& record) {
  if (recent != nullptr && recent->key == record.pool) return &recent->pool;
  const auto found = addrByKey.find(record.pool);
  return found == addrByKey.end() ? nullptr : &livePools.at(found->second).pool;
}

/// The address of a live record was allocated again, so its pool has been cleared between the two
/// lines. A known Clear already explains it if it comes after the first of them.
void TraceLedger::ProveClear(TracedPool& owner, LineNumber after, LineNumber before,
                             Verdict& verdict) {
  if (after < owner.clearBefore) {
    if (owner.clears.count == owner.clears.items.size())
      owner.clears.items.back().after = std::max(owner.clears.items.back().after, after);
    return;
  }
  owner.clears.Add({after, before});
  ++numClears;
  owner.clearBefore = before;
  verdict.cleared = owner.id.addr;
  MarkPeak(owner);
  bytes -= owner.bytes;
  owner.uncertainRecords += owner.records;
  owner.uncertainBytes += owner.bytes;
  owner.records = 0;
  owner.bytes = 0;
}

/// To be called before `bytes` of a pool changes: the first change after a peak keeps what the pool
/// held at the peak.
void TraceLedger::MarkPeak(TracedPool& pool) const {
  if (pool.peakMark == numPeaks) return;
  pool.peakMark = numPeaks;
  pool.bytesAtPeak = pool.bytes;
}

void TraceLedger::DropStale() {
  live.RemoveIf([&](const LiveRecord& record) { return OwnerOf(record) == nullptr; });
  numStale = 0;
}

PoolId TraceLedger::GetIdAt(std::uint64_t addr) const {
  const auto found = livePools.find(addr);
  return found == livePools.end() ? PoolId{0, addr} : found->second.pool.id;
}

std::vector<const TracedPool*> TraceLedger::GetLivePools() const {
  std::vector<const TracedPool*> pools;
  for (const auto& [addr, at] : livePools)
    pools.push_back(&at.pool);
  std::ranges::sort(pools, [](const TracedPool* a, const TracedPool* b) { return a->id < b->id; });
  return pools;
}

std::vector<TraceLedger::Live> TraceLedger::GetLiveRecords() const {
  std::vector<Live> records;
  for (const LiveRecord& record : live.GetPlaces()) {
    const auto owner = addrByKey.find(record.pool);
    if (record.line == 0 || owner == addrByKey.end()) continue;
    records.push_back(LiveOf(record, livePools.at(owner->second).pool));
  }
  std::sort(records.begin(), records.end(),
            [](const Live& a, const Live& b) { return a.line < b.line; });
  return records;
}

std::vector<std::pair<PoolId, std::uint64_t>> TraceLedger::GetPoolsAtPeak() const {
  auto pools = endedSincePeak;
  for (const auto& [addr, at] : livePools) {
    const std::uint64_t held = at.pool.peakMark == numPeaks ? at.pool.bytesAtPeak : at.pool.bytes;
    if (held > 0) pools.emplace_back(at.pool.id, held);
  }
  std::sort(pools.begin(), pools.end(), [](const auto& a, const auto& b) {
    return std::pair(b.second, a.first) < std::pair(a.second, b.first);
  });
  return pools;
}

} // namespace VOK::MemPool::Tools
