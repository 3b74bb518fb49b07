// The message lines of the library, one function per severity. Each gets the line of the statement
// that reports, and what the severity means happens here: an ERROR ends the process.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_MESSAGES_H
#define VOK_MEMPOOL_MESSAGES_H

#include <concepts>
#include <cstdint>
#include <initializer_list>

namespace VOK::MemPool {

class OutputLine;

namespace Messages {

/// One insertion of a message's text. A switch is written as the digit 1 or 0.
class Piece {
public:
  Piece(const char* text_) : text(text_), number(0) {}
  Piece(std::unsigned_integral auto number_) : text(nullptr), number(number_) {}

  void WriteTo(OutputLine& line) const;
  /// Writes the piece in decimal between `to` and `end`, cut to the room; returns its end there.
  char* WriteTo(char* to, const char* end) const;

private:
  const char* text; // null for a number
  std::uint64_t number;
};

using Text = std::initializer_list<Piece>;

/// Writes the line and ends the process through exit, with status 1.
[[noreturn]] void Error(Text text, unsigned line = __builtin_LINE());

/// Writes the line.
void Warning(Text text, unsigned line = __builtin_LINE());
void Info(Text text, unsigned line = __builtin_LINE());

/// Writes the one line on the standard error stream, and throws its text as a pointer to constant
/// characters. The text stays readable as long as the library is loaded.
[[noreturn]] void RefuseLoad(Text text, unsigned line = __builtin_LINE());

} // namespace Messages

} // namespace VOK::MemPool

#endif
