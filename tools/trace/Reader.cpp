#include "trace/Reader.h"

#include "MemPool"

namespace VOK::MemPool::Tools {

namespace {

constexpr std::string_view prefix = "zvpt:";

/// Takes values from the start of a text, by hand, because each line needs it.
class Taker {
public:
  explicit Taker(std::string_view text) : at(text.data()), end(at + text.size()) {}

  bool AtEnd() const { return at == end; }

  bool Take(char c) {
    if (at == end || *at != c) return false;
    ++at;
    return true;
  }

  /// 1 to 16 lower-case hexadecimal digits.
  bool TakeAddress(std::uint64_t& address) {
    const char* const start = at;
    address = 0;
    for (unsigned digit = 0; at != end && (digit = DigitOf(*at)) < 16; ++at)
      address = address << 4 | digit;
    return at != start && at - start <= 16;
  }

  /// A decimal number that a request can have, without a leading zero.
  bool TakeSize(std::uint32_t& size) {
    const char* const start = at;
    std::uint64_t number = 0;
    for (; at != end && *at >= '0' && *at <= '9' && number <= maxRequest; ++at)
      number = number * 10 + static_cast<unsigned>(*at - '0');
    size = static_cast<std::uint32_t>(number);
    return at != start && number <= maxRequest && (*start != '0' || at - start == 1);
  }

private:
  static unsigned DigitOf(char c) {
    if (c >= '0' && c <= '9') return static_cast<unsigned>(c - '0');
    return c >= 'a' && c <= 'f' ? static_cast<unsigned>(c - 'a' + 10) : 16;
  }

  const char* at;
  const char* const end;
};

bool TakeEvent(std::string_view text, TraceEvent& event) {
  Taker taker(text);
  event = {text.empty() ? '\0' : text.front()};
  const bool hasData = event.letter == 'a' || event.letter == 'f';
  if (!hasData && event.letter != 'c' && event.letter != 'd') return false;
  if (!taker.Take(event.letter) || !taker.Take(':') || !taker.TakeAddress(event.pool)) return false;
  if (hasData && !(taker.Take(':') && taker.TakeAddress(event.data) && taker.Take(':')))
    return false;
  if (event.letter == 'a' && !taker.TakeSize(event.size)) return false;
  return taker.AtEnd();
}

} // namespace

LineKind ReadTraceLine(std::string_view line, TraceEvent& event) {
  if (line.ends_with('\r')) line.remove_suffix(1);
  const bool begins = line.starts_with(prefix);
  if (begins && TakeEvent(line.substr(prefix.size()), event)) return LineKind::Event;
  return begins || line.find(prefix) != std::string_view::npos ? LineKind::Mixed : LineKind::Other;
}

} // namespace VOK::MemPool::Tools
