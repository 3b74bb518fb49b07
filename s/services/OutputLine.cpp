// The forming of fields by the rules of the standard stream, and the writing.
// Test: tests/output_test.cpp.
#include "services/OutputLine.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <locale>
#include <string>

namespace VOK::MemPool {

namespace {

/// Writes the digits up to `to`, grouped as the locale wants it; returns where they begin there.
/// The last of the group sizes holds for all further groups, and one below 1 ends the grouping.
char* Group(std::string_view digits, const std::locale& locale, char* to) {
  const auto& format = std::use_facet<std::numpunct<char>>(locale);
  const std::string sizes = format.grouping();
  std::size_t group = 0;
  int inGroup = 0;
  while (!digits.empty()) {
    if (group < sizes.size() && inGroup > 0 && inGroup == static_cast<signed char>(sizes[group])) {
      *--to = format.thousands_sep();
      inGroup = 0;
      if (group + 1 < sizes.size()) ++group;
    }
    *--to = digits.back();
    digits.remove_suffix(1);
    ++inGroup;
  }
  return to;
}

} // namespace

// The width is reset only where one is set: two threads may write lines at once, and a stream that
// no thread changes is safe to read.
OutputLine::OutputLine(std::ostream& stream_)
    : stream(stream_), flags(stream_.flags()), os(stream_.rdbuf()) {
  os.setstate(stream.rdstate());
  if (!os.good()) return;
  const std::ostream* const tied = stream.tie();
  if (tied != nullptr && tied->good()) std::ostream(tied->rdbuf()).flush();
  width = stream.width();
  if (width != 0) stream_.width(0);
}

OutputLine& OutputLine::operator<<(const char* field) {
  Field(field, 0);
  return *this;
}

OutputLine& OutputLine::operator<<(std::uint64_t field) {
  const std::ios::fmtflags base = flags & std::ios::basefield;
  const bool isHex = base == std::ios::hex;
  const bool isOctal = base == std::ios::oct;
  const bool isUpper = (flags & std::ios::uppercase) != 0;
  const bool hasPrefix = (flags & std::ios::showbase) != 0 && field != 0;

  char digits[22]; // 64 bits in octal
  char* const end = std::to_chars(digits, std::end(digits), field,
                                  isHex     ? 16
                                  : isOctal ? 8
                                            : 10)
                        .ptr;
  if (isUpper)
    std::transform(digits, end, digits, [](char c) { return c < 'a' ? c : char(c - 'a' + 'A'); });

  char number[2 + 2 * sizeof digits];
  char* begin = std::end(number);
  try {
    begin = Group({digits, end}, stream.getloc(), begin);
  } catch (...) { // the program's locale may throw; the line is lost, as by an insertion
    os.setstate(std::ios::badbit);
  }
  if (hasPrefix && isHex) *--begin = isUpper ? 'X' : 'x';
  if (hasPrefix && (isHex || isOctal)) *--begin = '0';
  Field({begin, std::end(number)}, hasPrefix && isHex ? 2 : 0);
  return *this;
}

OutputLine& OutputLine::Width(std::streamsize width_) {
  width = width_;
  return *this;
}

// The fill follows a field under `left`, its prefix under `internal`, and precedes it otherwise.
void OutputLine::Field(std::string_view field, std::size_t prefix) {
  const std::ios::fmtflags adjust = flags & std::ios::adjustfield;
  const std::size_t ahead = adjust == std::ios::left       ? field.size()
                            : adjust == std::ios::internal ? prefix
                                                           : 0;
  Append(field.substr(0, ahead));
  for (auto missing = width - static_cast<std::streamsize>(field.size()); missing > 0; --missing)
    Append(stream.fill());
  Append(field.substr(ahead));
  width = 0;
}

void OutputLine::Append(std::string_view part) {
  for (const char c : part)
    Append(c);
}

void OutputLine::Append(char c) {
  if (size == sizeof text) {
    os.write(text, sizeof text);
    size = 0;
  }
  text[size++] = c;
}

void OutputLine::End() {
  Append('\n');
  os.write(text, static_cast<std::streamsize>(size));
  os.flush();
}

} // namespace VOK::MemPool
