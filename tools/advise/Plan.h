// Which call sites could move to pools, and the operations that replay a recording with them there.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_PLAN_H
#define VOK_MEMPOOL_TOOLS_ADVISE_PLAN_H

#include "advise/Operations.h"
#include "advise/Statistics.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// Whether a site could have a pool, and why it couldn't.
struct Verdict {
  bool isCandidate;
  std::string reason; ///< of a candidate: what speaks for it
};

Verdict Judge(const Site& site, const Statistics& statistics);

/// The candidates with the most requests, `most` at most, by site number.
std::vector<std::uint32_t> FindCandidates(const Statistics& statistics, std::size_t most);

/// The operations of a contiguous part of a recording, in a file that goes with the object.
class OperationsFile {
public:
  /// Reads the recording again, once its statistics are there. `groupOf` has a group for each site,
  /// 0 for the heap. The part has up to `mostEvents`, and the peak in it.
  OperationsFile(Recording& recording, const Statistics& statistics,
                 const std::vector<std::uint8_t>& groupOf, std::uint64_t mostEvents);
  ~OperationsFile();
  OperationsFile(const OperationsFile&) = delete;
  OperationsFile& operator=(const OperationsFile&) = delete;

  const std::string& GetPath() const { return path; }

  std::uint64_t firstEvent = 0, lastEvent = 0; ///< of the part, numbered from 1
  bool IsWhole() const { return isWhole; }

private:
  struct Used {
    std::uint64_t data = 0; ///< the block's number
    std::uint64_t size = 0;
    std::uint32_t slot = 0;
    std::uint8_t group = 0;
    std::uint8_t alignmentLog = 0;
    bool isZero = false;
    bool IsUsed() const { return data != 0; }
  };
  /// The releases of a group since its last request.
  struct Run {
    std::uint64_t live = 0;
    std::vector<std::size_t> frees; ///< operations
  };

  void Take(const RecordedEvent& event, const Statistics& statistics,
            const std::vector<std::uint8_t>& groupOf);
  void Start();
  void Put(const Used& block, Action action, std::uint64_t size);
  void PutFree(const Used& block);
  std::uint32_t TakeSlot();
  void Write();

  std::string path;
  bool isWhole = true;
  bool isStarted = false;
  std::vector<Operation> operations;
  OperationsHeader header{};
  AddressTable<Used> blocks;
  std::vector<std::uint32_t> freeSlots;
  Run runs[mostGroups];
  std::uint64_t live = 0, peak = 0;
};

} // namespace VOK::MemPool::Tools

#endif
