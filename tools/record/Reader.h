// Reads the file of a recording, event by event.
// Test: tests/tools/record_test.py, fuzz/recording_fuzz.cpp.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_READER_H
#define VOK_MEMPOOL_TOOLS_RECORD_READER_H

#include "record/Format.h"

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// A request, a release, or both. Blocks have numbers from 1, in the order of the requests.
struct RecordedEvent {
  Entry kind;
  std::uint8_t alignmentLog = 0; ///< log2 of the alignment asked for, 0 if none was
  std::uint32_t stack = 0;       ///< of a request; 0: not recorded
  std::uint32_t thread = 0;
  std::uint64_t time = 0;  ///< microseconds since the start; advances by steps of some milliseconds
  std::uint64_t block = 0; ///< of Free the one released, else the new one; 0: unknown
  std::uint64_t old = 0;   ///< of Realloc: the one replaced
  std::uint64_t size = 0;

  bool IsRequest() const { return kind != Entry::Free && kind != Entry::FreeUnknown; }
};

struct RecordedModule {
  std::uint64_t address; ///< added to the addresses in the file
  std::string path;
  bool operator==(const RecordedModule&) const = default;
};

struct RecordedStack {
  std::vector<std::uint64_t> frames; ///< return addresses, the innermost first
  std::size_t modules = 0;           ///< the list of modules in which they lie
};

class Recording {
public:
  /// Puts up to `size` bytes at `to` and returns their number, fewer only at the end.
  using Source = std::function<std::size_t(char* to, std::size_t size)>;

  /// `name` is for messages. Fails on what isn't a recording.
  Recording(std::string name, Source source);

  /// The next event; false at the end. Fails on what can't be an entry.
  bool Next(RecordedEvent& event);

  std::int64_t process = 0, parent = 0;
  std::string executable;
  std::vector<std::string> command;
  std::vector<RecordedStack> stacks{1}; ///< by number; what is known so far
  std::vector<std::vector<RecordedModule>> modules{1};
  std::uint64_t numEvents = 0, numLost = 0;
  bool isCut = false; ///< at the end: the entry that ends a recording is missing

private:
  [[noreturn]] void Fail(std::string_view what) const;
  bool ReadBlock();
  bool TakeEntry(RecordedEvent& event);
  void TakeInformation(Entry kind);
  std::uint64_t TakeNumber(std::uint64_t most = ~std::uint64_t(0));
  std::string TakeText();
  std::uint64_t TakeBlock();
  void TakeStack();
  void EndModules();

  const std::string name;
  Source source;
  std::string stored, block;
  std::size_t at = 0; ///< in the block
  bool hasEnded = false;
  std::uint64_t lastBlock = 0, time = 0;
  std::uint32_t thread = 0;
  std::vector<RecordedModule> loading; ///< modules since the last Unload, until a stack follows
  bool isLoading = false;
};

/// The recording in a file; `name` is for messages.
Recording OpenRecording(const std::string& path, const std::string& name);

} // namespace VOK::MemPool::Tools

#endif
