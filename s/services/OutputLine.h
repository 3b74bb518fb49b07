// One line of the library's own: of trace, of a message, of the load failure. It reads the format
// of the program's stream and writes to its buffer, and changes neither: it never imbues the
// buffer, whose conversion can have a state, and sets no bit and no format of the stream.
// Test: tests/output_test.cpp.
#ifndef VOK_MEMPOOL_OUTPUTLINE_H
#define VOK_MEMPOOL_OUTPUTLINE_H

#include "services/Output.h"

#include <cstddef>
#include <cstdint>
#include <ios>
#include <ostream>
#include <string_view>

namespace VOK::MemPool {

/// The fields have the text that insertions into the stream would give, and the first one uses up
/// its pending width. A line that can't be written is lost and nothing is thrown, also where the
/// program asked the stream to throw: the operation that reports itself goes on.
///
/// Nothing comes from the heap, for a locale with up to 15 group sizes. So the digits of a number
/// are grouped here: std::num_put allocates a copy of each locale's format that it meets. A num_put
/// of the program's own isn't asked.
class OutputLine {
public:
  /// A stream that is tied to `stream` is flushed first.
  explicit OutputLine(std::ostream& stream = StandardOutput());
  OutputLine(const OutputLine&) = delete;
  OutputLine& operator=(const OutputLine&) = delete;

  OutputLine& operator<<(const char* field);
  OutputLine& operator<<(std::uint64_t field);

  /// The least width of the next field.
  OutputLine& Width(std::streamsize width);

  /// Writes the line with its newline, and flushes. A line of usual length is written in one piece.
  void End();

private:
  void Field(std::string_view field, std::size_t prefix);
  void Append(std::string_view part);
  void Append(char c);

  const std::ostream& stream;
  const std::ios::fmtflags flags;
  std::ostream os; // on the stream's buffer, with exceptions and a state of its own
  std::streamsize width = 0;
  std::size_t size = 0;
  char text[256];
};

} // namespace VOK::MemPool

#endif
