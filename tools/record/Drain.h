// Takes the events of one process from its ring, and writes them as a recording.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_DRAIN_H
#define VOK_MEMPOOL_TOOLS_RECORD_DRAIN_H

#include "common/AddressTable.h"
#include "record/Ring.h"
#include "record/Writer.h"

#include <map>
#include <memory>
#include <string>
#include <unordered_map>

namespace VOK::MemPool::Tools {

class Drain {
public:
  /// Maps the ring in the file `path`, which it then removes. Fails if `recording` can't be made.
  Drain(const std::string& path, const std::string& recording, unsigned depth);

  int GetProcess() const { return process; }
  const std::string& GetPath() const { return writer.GetPath(); }
  std::uint64_t GetNumEvents() const { return numEvents; }
  std::uint64_t GetNumLost() const { return numLost; }

  /// Writes what was published since the last call. False if that was nothing.
  bool Take();

  /// Writes what is left, and ends the recording. An event that its thread didn't complete is lost;
  /// a process that is still there goes on unrecorded.
  void End();

private:
  struct Live {
    std::uint64_t data = 0;  ///< the block's address
    std::uint64_t block = 0; ///< its number; 0 in an empty place
    bool IsUsed() const { return block != 0; }
  };
  struct Unmap {
    void operator()(Record::Ring* mapped) const;
  };

  const Record::Slot* Published(std::uint64_t position) const;
  std::uint64_t SlotsOf(const Record::Slot& slot) const;
  std::string TailOf(std::uint64_t position, std::uint64_t slots, std::uint64_t size) const;
  void PutSlots(std::uint64_t position, const Record::Slot& first, std::uint64_t slots);
  void PutInformation(Record::Kind kind, std::uint64_t address, const std::string& tail);
  void PutStack(std::uint32_t number, const std::string& frames);
  void PutEvent(Entry entry, std::initializer_list<std::uint64_t> numbers);
  void PutBlock(Record::Kind kind, const Record::Slot& slot);
  void PutFree(std::uint64_t address);
  std::uint64_t TakeBlock(std::uint64_t address);

  std::unique_ptr<Record::Ring, Unmap> ring;
  int process = 0;
  RecordingWriter writer;
  AddressTable<Live> live;
  std::map<std::uint64_t, std::pair<std::uint64_t, std::uint64_t>> reallocated;
  std::unordered_map<std::uint32_t, std::uint32_t> stackNumbers; ///< in the file, by the process's
  std::uint32_t numStacks = 0;
  std::uint64_t at = 0; ///< the next position
  std::uint64_t lastBlock = 0, time = 0, thread = 0;
  std::uint64_t numEvents = 0, numLost = 0;
};

} // namespace VOK::MemPool::Tools

#endif
