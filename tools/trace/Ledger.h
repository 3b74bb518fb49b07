// What the trace lines of a program come to: its pools, the records that live, and what the lines
// can't have told. One line after the other; memory goes with the live records alone.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_LEDGER_H
#define VOK_MEMPOOL_TOOLS_TRACE_LEDGER_H

#include "trace/LiveTable.h"
#include "trace/Reader.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace VOK::MemPool::Tools {

using LineNumber = std::uint64_t; ///< from 1; 0 where the line isn't in the trace

/// A list that would grow with the lines: it counts all, and keeps the first ones.
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

/// A Clear, which no line tells: it lies behind the first and in front of the second line.
struct ClearSpan {
  LineNumber after, before;
};

struct TracedPool {
  std::uint64_t addr = 0;
  LineNumber made = 0, gone = 0;
  std::uint64_t requests = 0, frees = 0;
  std::uint64_t records = 0, bytes = 0; ///< live for certain; at the end of a gone pool
  std::uint64_t uncertainRecords = 0, uncertainBytes = 0;
  std::uint64_t peakBytes = 0;
  Kept<ClearSpan> clears;
  LineNumber clearBefore = 0; ///< of the last Clear: older records are uncertain

  std::uint64_t peakMark = 0;    ///< the peak of all pools that `bytesAtPeak` belongs to
  std::uint64_t bytesAtPeak = 0; ///< kept when `bytes` changes after that peak
};

/// A pointer given back that wasn't live in its pool.
struct RefusedFree {
  LineNumber line;
  std::uint64_t pool, data;
  std::uint64_t owner; ///< the pool in which it was live, 0 for none
};

struct MixedLine {
  LineNumber line;
  std::string text; ///< its beginning
};

class TraceLedger {
public:
  struct Live {
    std::uint64_t data, pool;
    LineNumber line;
    std::uint32_t size;
    bool isUncertain;
  };

  enum class Outcome {
    Done,
    Refused,  ///< the pointer wasn't live in this pool
    Uncertain ///< the record lived in front of a Clear
  };

  struct Verdict {
    Outcome outcome = Outcome::Done;
    std::uint64_t cleared = 0; ///< the pool that the line proves to have been cleared
  };

  Kept<TracedPool> gone;
  std::map<std::uint32_t, std::uint64_t> requestsBySize;
  std::array<std::uint64_t, 64> lifetimes{}; ///< by the logarithm of the events from a to f
  Kept<RefusedFree> refused;
  Kept<MixedLine> mixed;
  std::uint64_t numEvents = 0, numMade = 0, numClears = 0;
  std::uint64_t bytes = 0; ///< live for certain, over all pools
  std::uint64_t peakBytes = 0, peakEvent = 0;
  LineNumber peakLine = 0;

  Verdict Take(LineNumber line, const TraceEvent& event);
  void TakeMixed(LineNumber line, std::string_view text);

  /// By the line of their making, and at the same line by address.
  std::vector<const TracedPool*> GetStanding() const;

  /// By line.
  std::vector<Live> GetLive() const;

  /// What each pool held at the peak, largest first.
  std::vector<std::pair<std::uint64_t, std::uint64_t>> GetPoolsAtPeak() const;

private:
  struct Standing {
    std::uint32_t key;
    TracedPool pool;
  };

  Standing& Find(std::uint64_t addr);
  Standing& Make(std::uint64_t addr, LineNumber line);
  void End(std::uint64_t addr, LineNumber line);
  void Alloc(Standing& standing, LineNumber line, const TraceEvent& event, Verdict& verdict);
  void Free(Standing& standing, LineNumber line, const TraceEvent& event, Verdict& verdict);
  TracedPool* OwnerOf(const LiveRecord& record);
  void ProveClear(TracedPool& owner, LineNumber after, LineNumber before, Verdict& verdict);
  void MarkPeak(TracedPool& pool) const;
  void DropStale();

  LiveTable live;                                             ///< may lag behind ended pools
  std::uint64_t numStale = 0;                                 ///< entries of ended pools
  std::unordered_map<std::uint64_t, Standing> standing;       ///< by address
  std::unordered_map<std::uint32_t, std::uint64_t> addrByKey; ///< of standing pools
  std::vector<std::pair<std::uint64_t, std::uint64_t>> endedSincePeak; ///< address and bytes
  std::uint32_t lastKey = 0;
  std::uint64_t numPeaks = 0;
  Standing* recent = nullptr; ///< the pool of the line in front, as the next is likely its own
};

} // namespace VOK::MemPool::Tools

#endif
