// What the trace lines of a program add up to: its pools, its live records, and what the lines
// leave uncertain. It takes one line after the other; memory grows with the live records alone.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_LEDGER_H
#define VOK_MEMPOOL_TOOLS_TRACE_LEDGER_H

#include "common/AddressTable.h"
#include "trace/Reader.h"

#include <array>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

namespace VOK::MemPool::Tools {

using LineNumber = std::uint64_t; ///< from 1; 0 where the line isn't in the trace

/// A list that would grow with the lines: it counts all items, and keeps the first ones.
template <class Item>
struct Kept {
  static constexpr std::size_t most = 100;

  std::uint64_t count = 0;
  std::vector<Item> items;

  void Add(const Item& item) {
    ++count;
    if (items.size() < most) items.push_back(item);
  }
};

/// A Clear, which writes no line: it happened between these two lines.
struct ClearSpan {
  LineNumber after, before;
};

/// Two pools of one address differ in the line of their construction.
struct PoolId {
  LineNumber made = 0;
  std::uint64_t addr = 0;
  bool operator<(const PoolId& other) const {
    return std::pair(made, addr) < std::pair(other.made, other.addr);
  }
};

struct TracedPool {
  PoolId id;
  LineNumber gone = 0;
  std::uint64_t requests = 0, frees = 0;
  std::uint64_t records = 0, bytes = 0; ///< certainly live; of a destroyed pool, at its end
  std::uint64_t uncertainRecords = 0, uncertainBytes = 0;
  std::uint64_t peakBytes = 0;
  Kept<ClearSpan> clears;
  LineNumber clearBefore = 0; ///< of the last Clear: older records are uncertain

  std::uint64_t peakMark = 0;    ///< the peak of all pools that `bytesAtPeak` belongs to
  std::uint64_t bytesAtPeak = 0; ///< kept when `bytes` changes after that peak
};

/// A freed pointer that wasn't live in its pool.
struct RefusedFree {
  LineNumber line;
  PoolId pool;
  std::uint64_t data;
  std::optional<PoolId> owner; ///< the pool in which it was live
};

struct MixedLine {
  LineNumber line;
  std::string text; ///< its beginning
};

struct LiveRecord {
  std::uint64_t data = 0;  ///< what the caller holds
  std::uint64_t line = 0;  ///< of its request; 0 in an empty place of the table
  std::uint64_t event = 0; ///< its number among the trace lines
  std::uint32_t size = 0;  ///< as asked for
  std::uint32_t pool = 0;  ///< the key of its pool

  bool IsUsed() const { return line != 0; }
};

class TraceLedger {
public:
  struct Live {
    std::uint64_t data;
    PoolId pool;
    LineNumber line;
    std::uint32_t size;
    bool isUncertain;
    LineNumber gone = 0; ///< of its pool; 0 while that is live
  };

  enum class Outcome {
    Done,
    Refused,  ///< the pointer wasn't live in this pool
    Uncertain ///< the record was live before a Clear
  };

  struct Verdict {
    Outcome outcome = Outcome::Done;
    std::uint64_t cleared = 0; ///< the pool that was cleared, as the line proves
  };

  Kept<TracedPool> gone;
  Kept<Live> left; ///< in pools that are gone, pool by pool
  std::map<std::uint32_t, std::uint64_t> requestsBySize;
  std::array<std::uint64_t, 64> lifetimes{}; ///< by the logarithm of the events from a to f
  Kept<RefusedFree> refused;
  Kept<MixedLine> mixed;
  std::uint64_t numEvents = 0, numMade = 0, numClears = 0;
  std::uint64_t bytes = 0; ///< certainly live, over all pools
  std::uint64_t peakBytes = 0, peakEvent = 0;
  LineNumber peakLine = 0;

  Verdict Take(LineNumber line, const TraceEvent& event);
  void TakeMixed(LineNumber line, std::string_view text);

  /// The live pool of an address, also one without a trace line so far.
  PoolId GetIdAt(std::uint64_t addr) const;

  /// By the line of their construction, and at the same line by address.
  std::vector<const TracedPool*> GetLivePools() const;

  /// By line.
  std::vector<Live> GetLiveRecords() const;

  /// What each pool held at the peak, largest first.
  std::vector<std::pair<PoolId, std::uint64_t>> GetPoolsAtPeak() const;

private:
  struct LivePool {
    std::uint32_t key;
    TracedPool pool;
  };

  LivePool& Find(std::uint64_t addr);
  LivePool& Begin(std::uint64_t addr, LineNumber line);
  void End(std::uint64_t addr, LineNumber line);
  void KeepLeft(const LivePool& at);
  static Live LiveOf(const LiveRecord& record, const TracedPool& pool);
  void Alloc(LivePool& at, LineNumber line, const TraceEvent& event, Verdict& verdict);
  void Free(LivePool& at, LineNumber line, const TraceEvent& event, Verdict& verdict);
  TracedPool* OwnerOf(const LiveRecord& record);
  void ProveClear(TracedPool& owner, LineNumber after, LineNumber before, Verdict& verdict);
  void MarkPeak(TracedPool& pool) const;
  void DropStale();

  AddressTable<LiveRecord> live;                         ///< also those of ended pools, for a while
  std::uint64_t numStale = 0;                            ///< entries of ended pools
  std::unordered_map<std::uint64_t, LivePool> livePools; ///< by address
  std::unordered_map<std::uint32_t, std::uint64_t> addrByKey;   ///< of live pools
  std::vector<std::pair<PoolId, std::uint64_t>> endedSincePeak; ///< with bytes
  std::uint32_t lastKey = 0;
  std::uint64_t numPeaks = 0;
  LivePool* recent = nullptr; ///< the pool of the previous line, likely that of the next too
};

} // namespace VOK::MemPool::Tools

#endif
