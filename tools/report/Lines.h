// A text line by line, and a line value by value, each accepted only in the exact form in which a
// report prints it. Anything else is a Failure that names the line.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_LINES_H
#define VOK_MEMPOOL_TOOLS_REPORT_LINES_H

#include "common/Tool.h"
#include "report/Model.h"

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

/// A line that isn't what a report has there.
struct LineFailure : Failure {
  LineFailure(std::size_t line_, const std::string& text) : Failure(text), line(line_) {}

  std::size_t line;
};

/// The lines of a text, of which the last may lack its end.
class Lines {
public:
  bool isCrLf = false;    ///< lines end as on Windows, and are returned without them
  bool isLenient = false; ///< a line may lack the blanks at its end

  explicit Lines(std::string_view text_) : text(text_) {}

  bool AtEnd() const { return begin == text.size(); }
  std::size_t GetNumber() const { return number; } ///< of the present line, from 1

  /// The present line, and the one after it; empty at the end of the text.
  std::string_view Get() const { return LineAt(begin); }
  std::string_view GetSecond() const { return LineAt(EndAt(begin)); }
  bool StartsWith(std::string_view start) const { return Get().starts_with(start); }

  void Skip();

  /// Skips the present line if it is this one, and fails otherwise.
  void SkipExactly(std::string_view line);

  /// Fails unless there is a present line, with its line end.
  void CheckWhole(std::string_view expected) const;

  /// Whether what is left of the present line is this text, as far as it must be.
  bool IsLast(std::string_view rest, std::string_view expected) const;

  [[noreturn]] void Fail(std::string_view expected, std::size_t column = 0) const;

private:
  std::size_t EndAt(std::size_t at) const;
  std::string_view LineAt(std::size_t at) const;

  const std::string_view text;
  std::size_t begin = 0;
  std::size_t number = 1;
};

/// The values of the present line, from left to right.
class Fields {
public:
  /// Fails if the present line is cut off. `expected` says what it should be.
  Fields(const Lines& lines, std::string_view expected);

  bool AtEnd() const { return at == line.size(); }
  bool StartsWith(std::string_view start) const { return line.substr(at).starts_with(start); }

  std::string_view GetRest() const { return line.substr(at); }

  void TakeText(std::string_view expected);
  char TakeOneOf(std::string_view characters);
  std::string_view TakeFirst(std::size_t count);
  std::string_view TakeRest() { return TakeFirst(line.size() - at); }
  void TakeEnd() const;

  /// At the right of a field, which a longer value exceeds.
  Number TakeNumber(int width = 0);
  Address TakeAddress(int width = 0);
  Percent TakePercent(int width);
  Type TakeType(int width);

  /// At the left of a field.
  Number TakeLeftNumber(int width);
  Type TakeLeftType(int width, bool& isHead);

  Id TakeId(int width);
  Bar TakeBar();

  [[noreturn]] void Fail(std::string_view expected) const { lines.Fail(expected, at + 1); }

private:
  std::string_view TakeField(int width, std::string_view characters, std::string_view expected);
  std::string_view TakeRun(std::string_view characters);

  const Lines& lines;
  const std::string_view line;
  std::size_t at = 0;
};

/// Takes the next report, nothing if there is none; `title` becomes the line of its title. Throws
/// LineFailure, and then the lines are inside the report.
std::optional<Report> TakeReport(Lines& lines, std::size_t& title);

} // namespace VOK::MemPool::Tools

#endif
