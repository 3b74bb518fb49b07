// The trace lines of a program's output: the content of a line, and the lines of a long text one by
// one.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_READER_H
#define VOK_MEMPOOL_TOOLS_TRACE_READER_H

#include "common/Files.h"

#include <cstdint>
#include <cstring>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

struct TraceEvent {
  char letter = 0;        ///< c: construction, d: destruction, a: request served, f: Free
  std::uint64_t pool = 0; ///< its address
  std::uint64_t data = 0; ///< of a and f: what the caller holds
  std::uint32_t size = 0; ///< of a: the bytes asked for
};

enum class LineKind {
  Other, ///< a line of the program
  Event,
  Mixed ///< a trace line begins in it, and it isn't one from its first to its last character
};

/// Reads a line, given without its end, into `event`.
LineKind ReadTraceLine(std::string_view line, TraceEvent& event);

/// Calls `take(line, isWhole)` for each line of a text until it returns false. The last line may
/// lack its end, and isn't whole then. Holds one line and one read of the text.
template <class Take>
void ForEachLine(Input& input, Progress& progress, Take take) {
  constexpr std::size_t readSize = 1 << 20;
  std::vector<char> buffer;
  std::size_t kept = 0; // of a line that has begun
  for (;;) {
    if (buffer.size() < kept + readSize) buffer.resize(2 * kept + readSize);
    const std::size_t read = input.Read(buffer.data() + kept, readSize);
    if (read == 0) break;
    progress.Add(read);
    const char* begin = buffer.data();
    const char* search = begin + kept;
    const char* const end = search + read;
    while (const void* found = std::memchr(search, '\n', static_cast<std::size_t>(end - search))) {
      const char* const lineEnd = static_cast<const char*>(found);
      if (!take(std::string_view(begin, static_cast<std::size_t>(lineEnd - begin)), true)) return;
      begin = search = lineEnd + 1;
    }
    kept = static_cast<std::size_t>(end - begin);
    std::memmove(buffer.data(), begin, kept);
  }
  if (kept > 0) take(std::string_view(buffer.data(), kept), false);
}

} // namespace VOK::MemPool::Tools

#endif
