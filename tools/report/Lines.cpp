#include "report/Lines.h"

#include "report/Form.h"

#include <algorithm>
#include <charconv>
#include <fmt/format.h>
#include <optional>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::string_view decimal = "0123456789";
constexpr Type types[] = {Type::Free, Type::Used, Type::Ext, Type::Unknown};

/// A piece of a text for a message: printable, and not long.
std::string Quoted(std::string_view text) {
  constexpr std::size_t most = 60;
  std::string quoted = "\"";
  for (const char c : text.substr(0, most))
    quoted += c < ' ' || c > '~' ? fmt::format("\\x{:02x}", static_cast<unsigned char>(c))
                                 : std::string(1, c);
  return quoted + (text.size() > most ? "\"..." : "\"");
}

/// The digits as the library's stream prints a number: no leading zero, and within range.
template <class Unsigned>
std::optional<Unsigned> ToNumber(std::string_view digits, int base = 10) {
  Unsigned number = 0;
  const char* const end = digits.data() + digits.size();
  const auto result = std::from_chars(digits.data(), end, number, base);
  if (result.ec != std::errc() || result.ptr != end) return std::nullopt;
  if (digits.size() > 1 && digits.front() == '0') return std::nullopt;
  return number;
}

} // namespace

void Lines::Skip() {
  begin = EndAt(begin);
  ++number;
}

void Lines::SkipExactly(std::string_view line) {
  const std::string expected = line.empty() ? "an empty line" : "the line " + Quoted(line);
  CheckWhole(expected);
  if (!IsLast(Get(), line)) Fail(expected);
  Skip();
}

bool Lines::IsLast(std::string_view rest, std::string_view expected) const {
  return rest == expected ||
         (isLenient && rest == expected.substr(0, expected.find_last_not_of(' ') + 1));
}

void Lines::CheckWhole(std::string_view expected) const {
  if (AtEnd()) Fail(expected);
  const std::size_t end = EndAt(begin);
  if (text[end - 1] != '\n')
    Fail(fmt::format("{}, with a line end", expected));
  else if (isCrLf && (end - begin < 2 || text[end - 2] != '\r'))
    Fail(fmt::format("{}, with a line end of CR and LF", expected));
}

void Lines::Fail(std::string_view expected, std::size_t column) const {
  const std::string found = AtEnd() ? "the end of the text" : Quoted(Get());
  throw LineFailure(number, column == 0 ? fmt::format("expected {}, found {}", expected, found)
                                        : fmt::format("expected {} in column {}, found {}",
                                                      expected, column, found));
}

std::size_t Lines::EndAt(std::size_t at) const {
  const std::size_t end = text.find('\n', at);
  return end == std::string_view::npos ? text.size() : end + 1;
}

std::string_view Lines::LineAt(std::size_t at) const {
  std::string_view line = text.substr(at, EndAt(at) - at);
  if (line.ends_with('\n')) line.remove_suffix(1);
  if (isCrLf && line.ends_with('\r')) line.remove_suffix(1);
  return line;
}

Fields::Fields(const Lines& lines_, std::string_view expected) : lines(lines_), line(lines_.Get()) {
  lines.CheckWhole(expected);
}

void Fields::TakeText(std::string_view expected) {
  if (!StartsWith(expected) && !lines.IsLast(GetRest(), expected)) Fail(Quoted(expected));
  TakeFirst(expected.size());
}

char Fields::TakeOneOf(std::string_view characters) {
  if (AtEnd() || characters.find(line[at]) == std::string_view::npos)
    Fail("one of " + Quoted(characters));
  return line[at++];
}

std::string_view Fields::TakeFirst(std::size_t count) {
  const std::string_view first = line.substr(at, count);
  at += first.size();
  return first;
}

void Fields::TakeEnd() const {
  if (!AtEnd()) Fail("the end of the line");
}

Number Fields::TakeNumber(int width) {
  const std::string expected = width == 0 ? "a decimal number up to 4294967295"
                                          : fmt::format("a decimal number up to 4294967295 at the "
                                                        "right of {} columns",
                                                        width);
  const std::size_t start = at;
  const auto number = ToNumber<Number>(TakeField(width, decimal, expected));
  at = number ? at : start;
  if (!number) Fail(expected);
  return *number;
}

Address Fields::TakeAddress(int width) {
  const int columns = std::max(width, 8);
  const std::string expected = fmt::format("an address at the right of {} columns", columns);
  const std::size_t start = at;
  std::string_view digits = TakeField(columns, "0123456789abcdefx", expected);
  if (digits == "0") return {};
  if (digits.starts_with("0x")) {
    digits.remove_prefix(2);
    const auto value = ToNumber<std::uint64_t>(digits, 16);
    if (value && *value != 0) return {*value};
  }
  at = start;
  Fail(expected);
}

Percent Fields::TakePercent(int width) {
  const std::string expected =
      fmt::format("a number with three decimals at the right of {} columns", width);
  const std::size_t start = at;
  const std::string_view text = TakeField(width, "0123456789.", expected);
  const std::size_t point = std::min(text.find('.'), text.size());
  const auto whole = ToNumber<std::uint64_t>(text.substr(0, point));
  const std::string_view decimals = text.substr(std::min(point + 1, text.size()));
  if (!whole || *whole > maxPercent || decimals.size() != 3 ||
      decimals.find('.') != std::string::npos) {
    at = start;
    Fail(expected);
  }
  std::uint64_t thousandths = *whole;
  for (const char digit : decimals)
    thousandths = thousandths * 10 + static_cast<std::uint64_t>(digit - '0');
  return {thousandths};
}

Type Fields::TakeType(int width) {
  for (const Type type : types) {
    const std::string text = fmt::format("{:>{}}", TypeText(type), width);
    if (!StartsWith(text)) continue;
    at += text.size();
    return type;
  }
  Fail(fmt::format("a record's type at the right of {} columns", width));
}

Number Fields::TakeLeftNumber(int width) {
  const std::string expected = fmt::format("a decimal number at the left of {} columns", width);
  const std::size_t start = at;
  const auto number = ToNumber<Number>(TakeRun(decimal));
  if (!number) {
    at = start;
    Fail(expected);
  }
  const std::size_t end = std::max(at, start + static_cast<std::size_t>(width));
  TakeText(std::string(end - at, ' '));
  return *number;
}

Type Fields::TakeLeftType(int width, bool& isHead) {
  for (const Type type : types) {
    for (const bool mark : {true, false}) {
      const std::string text =
          fmt::format("{:<{}}", fmt::format("{}{}", TypeText(type), mark ? " +" : ""), width);
      if (!StartsWith(text)) continue;
      at += text.size();
      isHead = mark;
      return type;
    }
  }
  Fail(fmt::format("a record's type at the left of {} columns", width));
}

Id Fields::TakeId(int width) {
  const std::string expected = fmt::format("a number padded with zeros to {} columns", width);
  const std::size_t start = at;
  std::string_view digits = TakeRun(decimal);
  const bool isPadded = digits.size() == static_cast<std::size_t>(width);
  if (isPadded) digits.remove_prefix(std::min(digits.find_first_not_of('0'), digits.size() - 1));
  const auto number = ToNumber<Number>(digits);
  if (!number || (!isPadded && digits.size() < static_cast<std::size_t>(width))) {
    at = start;
    Fail(expected);
  }
  return {*number};
}

Bar Fields::TakeBar() {
  const std::string expected = fmt::format("a bar of 1 to {} stars", maxStars);
  const std::size_t start = at;
  const std::size_t stars = TakeRun("*").size();
  if (stars < 1 || stars > maxStars) {
    at = start;
    Fail(expected);
  }
  const bool more = StartsWith("+");
  at += more ? 1 : 0;
  return {static_cast<Number>(stars), more};
}

std::string_view Fields::TakeField(int width, std::string_view characters,
                                   std::string_view expected) {
  const std::size_t start = at;
  const std::size_t spaces = TakeRun(" ").size();
  const std::string_view value = TakeRun(characters);
  const std::size_t length = spaces + value.size();
  const auto columns = static_cast<std::size_t>(width);
  if (value.empty() || length < columns || (spaces > 0 && length > columns)) {
    at = start;
    Fail(expected);
  }
  return value;
}

std::string_view Fields::TakeRun(std::string_view characters) {
  const std::size_t end = std::min(line.find_first_not_of(characters, at), line.size());
  const std::string_view run = line.substr(at, end - at);
  at = end;
  return run;
}

} // namespace VOK::MemPool::Tools
