// Every line of the library that is neither trace nor report is formed here.
// Test: tests/process_test.py.
#include "services/Messages.h"

#include "services/OutputLine.h"

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <cstring>

namespace VOK::MemPool::Messages {

namespace {

const char* const source = "../s/MemPool";

// Field by field, in whatever format the stream has; the source line alone has a width.
__attribute__((cold)) void WriteLine(const char* severity, Text text, unsigned line) {
  OutputLine output;
  output << severity << ":" << source << ":";
  output.Width(5) << line << ": ";
  for (const Piece& piece : text)
    piece.WriteTo(output);
  output.End();
}

} // namespace

void Piece::WriteTo(OutputLine& line) const {
  if (text != nullptr)
    line << text;
  else
    line << number;
}

char* Piece::WriteTo(char* to, const char* end) const {
  char digits[20];
  const char* const from = text != nullptr ? text : digits;
  const std::size_t length =
      text != nullptr
          ? std::strlen(text)
          : static_cast<std::size_t>(std::to_chars(digits, std::end(digits), number).ptr - digits);
  return std::copy_n(from, std::min(length, static_cast<std::size_t>(end - to)), to);
}

void Error(Text text, unsigned line) {
  WriteLine("ERROR", text, line);
  std::exit(EXIT_FAILURE);
}

void Warning(Text text, unsigned line) { WriteLine("WARNING", text, line); }

void Info(Text text, unsigned line) { WriteLine("INFO", text, line); }

void RefuseLoad(Text text, unsigned line) {
  // Static, so that it outlives the unwinding; formed by hand, so that no locale has a say.
  static char refusal[160];
  char* to = refusal;
  const char* const end = std::end(refusal) - 1;
  for (const Piece& piece :
       {Piece("EXCEPTION:"), Piece(source), Piece(":"), Piece(line), Piece(": ")})
    to = piece.WriteTo(to, end);
  for (const Piece& piece : text)
    to = piece.WriteTo(to, end);
  *to = '\0';
  (OutputLine(StandardError()) << refusal).End();
  throw static_cast<const char*>(refusal);
}

} // namespace VOK::MemPool::Messages
