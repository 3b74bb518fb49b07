// The lenient reading: it brings a text into the form that the strict one reads.
#include "common/Tool.h"
#include "report/Form.h"
#include "report/Formats.h"
#include "report/Lines.h"

#include <algorithm>
#include <cctype>
#include <fmt/format.h>
#include <span>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t mostForeign = 1000; // lines in one report

struct Line {
  std::size_t begin;  ///< in the text as it is now
  std::size_t number; ///< in the text as it was
};

bool IsDigit(char c) { return std::isdigit(static_cast<unsigned char>(c)) != 0; }

/// What a log puts before each line of a report: the same but for digits.
class Prefix {
public:
  explicit Prefix(std::string_view form_ = {}) : form(form_) {}

  bool Starts(std::string_view line) const {
    // A log may remove the blanks at the end of a line that is empty but for this.
    const std::string_view start = line.size() < form.size() ? form.substr(0, line.size()) : form;
    return !form.empty() && form.find_last_not_of(' ') < line.size() &&
           std::ranges::equal(start, line.substr(0, start.size()),
                              [](char a, char b) { return a == b || (IsDigit(a) && IsDigit(b)); });
  }
  std::string_view RestOf(std::string_view line) const {
    return line.substr(std::min(form.size(), line.size()));
  }

private:
  std::string_view form;
};

class Text {
public:
  Text(std::string_view original, PassedOver& passed_) : passed(passed_) {
    std::vector<std::string_view> parts = Split(original);
    RemovePrefixes(parts);
    text.reserve(original.size() + 1);
    for (const std::string_view part : parts) {
      lines.push_back({text.size(), lines.size() + 1});
      text.append(part) += '\n';
    }
  }

  ReportText Read() {
    for (bool isMore = !lines.empty(); isMore;) {
      Lines own(std::string_view(text).substr(lines[at].begin));
      own.isLenient = true;
      isMore = ReadFrom(own);
    }
    return std::move(result);
  }

private:
  std::vector<std::string_view> Split(std::string_view rest) {
    std::vector<std::string_view> parts;
    while (!rest.empty()) {
      const std::size_t end = std::min(rest.find('\n'), rest.size());
      std::string_view part = rest.substr(0, end);
      if (part.ends_with('\r')) {
        part.remove_suffix(1);
        ++passed.lineEnds;
      }
      parts.push_back(part);
      rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    return parts;
  }

  /// A title begins a prefix if the next line that begins likewise goes on with the report.
  void RemovePrefixes(std::vector<std::string_view>& parts) {
    Prefix prefix;
    for (std::size_t i = 0; i < parts.size(); ++i) {
      if (const std::size_t title = parts[i].find(PoolTitle::pool); title != parts[i].npos) {
        const Prefix own(parts[i].substr(0, title));
        prefix = IsPrefix(own, std::span(parts).subspan(i + 1)) ? own : Prefix();
      }
      if (!prefix.Starts(parts[i])) continue;
      parts[i] = prefix.RestOf(parts[i]);
      ++passed.prefixes;
    }
  }

  bool IsPrefix(const Prefix& prefix, std::span<const std::string_view> following) const {
    const auto near = following.first(std::min(following.size(), mostForeign));
    const auto next =
        std::ranges::find_if(near, [&](std::string_view part) { return prefix.Starts(part); });
    return next != near.end() && prefix.RestOf(*next).starts_with(versionStart);
  }

  std::size_t EndOf(std::size_t i) const {
    return i + 1 < lines.size() ? lines[i + 1].begin : text.size();
  }
  std::string_view TextOf(std::size_t i) const {
    return std::string_view(text).substr(lines[i].begin, EndOf(i) - lines[i].begin - 1);
  }

  /// Removes a line from the report that begins at `at`. The lines before it move towards it, so
  /// that the cost doesn't grow with the rest of the text.
  void Remove(std::size_t i) {
    foreign.push_back(lines[i].number);
    const std::size_t length = EndOf(i) - lines[i].begin;
    char* const data = text.data();
    std::move_backward(data + lines[at].begin, data + lines[i].begin, data + EndOf(i));
    for (; i > at; --i)
      lines[i] = {lines[i - 1].begin + length, lines[i - 1].number};
    ++at;
  }

  /// Reads reports up to the end, or up to a line of another, which goes. False at the end.
  bool ReadFrom(Lines& own) {
    const std::size_t base = at;
    std::size_t title = 0;
    try {
      while (std::optional<Report> report = TakeReport(own, title)) {
        at = base + own.GetNumber() - 1;
        Accept(*report, base + title - 1);
      }
      return false;
    } catch (const LineFailure& failure) {
      const std::size_t i = base + failure.line - 1;
      at = std::max(at, base + title - 1);
      if (i < lines.size() && foreign.size() < mostForeign && !IsTitle(i)) {
        Remove(i);
      } else {
        if (result.cut.empty())
          result.cut = fmt::format("line {}: {}", NumberOf(i), failure.what());
        at = std::max(i, at + 1);
        foreign.clear();
      }
      return at < lines.size();
    }
  }

  void Accept(Report& report, std::size_t title) {
    const std::string written = WriteReport(report);
    Lines own(written);
    for (std::size_t i = title; i < at; ++i, own.Skip())
      if (TextOf(i).size() < own.Get().size()) ++passed.blanks;
    if (passed.lines == 0 && !foreign.empty()) passed.firstLine = foreign.front();
    passed.lines += foreign.size();
    report.line = lines[title].number;
    NumberLines(report);
    result.reports.push_back(std::move(report));
    foreign.clear();
  }

  /// Whether a report begins here, with few lines of others in it so far.
  bool IsTitle(std::size_t i) const {
    constexpr std::size_t most = 10;
    if (!TextOf(i).starts_with(PoolTitle::pool)) return false;
    for (std::size_t next = i; next < std::min(i + most, lines.size()); ++next)
      if (TextOf(next).starts_with(versionStart)) return true;
    return false;
  }

  std::size_t NumberOf(std::size_t i) const {
    return i < lines.size() ? lines[i].number : lines.back().number + 1;
  }

  const std::string versionStart = fmt::format("{}{}", headerIndent, PoolLabel::version);
  PassedOver& passed;
  std::string text; ///< without prefixes, each line with its end
  std::vector<Line> lines;
  std::size_t at = 0;               ///< the next line
  std::vector<std::size_t> foreign; ///< lines removed from the report that is read
  ReportText result;
};

} // namespace

std::string PassedOver::Say() const {
  std::string said;
  const auto add = [&](std::size_t count, const std::string& what) {
    if (count > 0) said += fmt::format("{}{}", said.empty() ? "" : ", ", what);
  };
  const auto counted = [](std::size_t count) {
    return fmt::format("{} line{}", count, count == 1 ? "" : "s");
  };
  add(lines, fmt::format("{} that no report has, the first is line {}", counted(lines), firstLine));
  add(prefixes, "a prefix on " + counted(prefixes));
  add(blanks, "blanks missing at the end of " + counted(blanks));
  add(lineEnds, "CR and LF at the end of " + counted(lineEnds));
  return said.empty() ? "" : "passed over " + said;
}

ReportText ReadReportsLeniently(std::string_view text, PassedOver& passed) {
  return Text(text, passed).Read();
}

} // namespace VOK::MemPool::Tools
