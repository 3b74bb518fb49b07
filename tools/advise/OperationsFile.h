// Writes the operations of a contiguous part of a recording, for replays.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_OPERATIONSFILE_H
#define VOK_MEMPOOL_TOOLS_ADVISE_OPERATIONSFILE_H

#include "advise/Operations.h"
#include "common/AddressTable.h"
#include "common/Programs.h"
#include "record/Reader.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// Events to replay, numbered from 0: `first` and what follows before `last`.
struct Part {
  std::uint64_t first = 0, last = ~std::uint64_t(0);

  /// Up to `most` of the events of a recording, with its peak in the last quarter.
  static Part Around(std::uint64_t peak, std::uint64_t events, std::uint64_t most);
};

/// A file in memory, which goes with the object. It has no block that a pool would refuse for its
/// size: what is larger stays with the heap whatever is advised.
class OperationsFile {
public:
  /// `isPlain`: the sizes are what a pool was asked for. Else what asks for multiples of 8 bytes
  /// alone is taken for objects with pointers, which an adaptor aligns.
  explicit OperationsFile(const Part& part, bool isPlain = false);

  /// Takes all events in turn, those before the part too; those after it change nothing. `group` is
  /// that of a request, 0 for the heap. A block keeps the group that it was made in.
  void Take(const RecordedEvent& event, std::uint8_t group);

  /// Once all were taken. Fails if the file can't be written.
  void Write();

  const std::string& GetPath() const { return file.GetPath(); }

private:
  struct Block {
    std::uint64_t data = 0; ///< its number
    std::uint64_t size = 0;
    std::uint32_t slot = 0;
    std::uint8_t group = 0;
    std::uint8_t alignmentLog = 0;
    bool IsUsed() const { return data != 0; }
  };
  /// The releases of a group since its last request.
  struct Run {
    std::uint64_t live = 0;
    std::vector<std::size_t> frees; ///< operations
  };

  void Start();
  void Put(const Block& block, Action action);
  void PutFree(const Block& block);
  std::uint32_t TakeSlot();

  const Part part;
  HeldFile file;
  bool isStarted = false;
  std::uint64_t numEvents = 0;
  std::vector<Operation> operations;
  OperationsHeader header{};
  AddressTable<Block> blocks;
  std::vector<std::uint32_t> freeSlots;
  Run runs[mostGroups];
  std::uint64_t live = 0, peak = 0;
};

} // namespace VOK::MemPool::Tools

#endif
