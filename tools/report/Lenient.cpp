// The lenient reading: it brings a text into the form that the strict one reads.
#include "common/Tool.h"
#include "report/Form.h"
#include "report/Formats.h"
#include "report/Lines.h"
#include "report/Reader.h"

#include <algorithm>
#include <cctype>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t mostForeign = 1000; // lines in one report

struct Line {
  std::string_view text;
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
  Text(std::string_view text, PassedOver& passed_) : passed(passed_) {
    Split(text);
    RemovePrefixes();
  }

  ReportText Read() {
    for (bool isMore = true; isMore;) {
      const std::string text = TextFrom(at);
      Lines own(text);
      own.isLenient = true;
      isMore = ReadFrom(own);
    }
    return std::move(result);
  }

private:
  void Split(std::string_view text) {
    while (!text.empty()) {
      const std::size_t end = std::min(text.find('\n'), text.size());
      std::string_view line = text.substr(0, end);
      if (line.ends_with('\r')) {
        line.remove_suffix(1);
        ++passed.lineEnds;
      }
      lines.push_back({line, lines.size() + 1});
      text.remove_prefix(std::min(end + 1, text.size()));
    }
  }

  /// A title begins a prefix if the next line that begins likewise goes on with the report.
  void RemovePrefixes() {
    Prefix prefix;
    for (std::size_t i = 0; i < lines.size(); ++i) {
      std::string_view& line = lines[i].text;
      if (const std::size_t title = line.find(PoolTitle::pool); title != line.npos) {
        const Prefix own(line.substr(0, title));
        prefix = IsPrefix(own, i) ? own : Prefix();
      }
      if (!prefix.Starts(line)) continue;
      line = prefix.RestOf(line);
      ++passed.prefixes;
    }
  }

  bool IsPrefix(const Prefix& prefix, std::size_t title) const {
    const auto next =
        std::find_if(lines.begin() + static_cast<std::ptrdiff_t>(title) + 1, lines.end(),
                     [&](const Line& l) { return prefix.Starts(l.text); });
    return next != lines.end() && prefix.RestOf(next->text).starts_with(versionStart);
  }

  std::string TextFrom(std::size_t begin) const {
    std::string text;
    for (std::size_t i = begin; i < lines.size(); ++i)
      text.append(lines[i].text).append("\n");
    return text;
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
        foreign.push_back(lines[i].number);
        lines.erase(lines.begin() + static_cast<std::ptrdiff_t>(i));
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
      if (lines[i].text.size() < own.Get().size()) ++passed.blanks;
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
    const auto next = lines.begin() + static_cast<std::ptrdiff_t>(i);
    const auto end = next + std::min<std::ptrdiff_t>(most, lines.end() - next);
    return next->text.starts_with(PoolTitle::pool) &&
           std::any_of(next, end, [&](const Line& l) { return l.text.starts_with(versionStart); });
  }

  std::size_t NumberOf(std::size_t i) const {
    return i < lines.size() ? lines[i].number : lines.back().number + 1;
  }

  const std::string versionStart = fmt::format("{}{}", headerIndent, PoolLabel::version);
  PassedOver& passed;
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
