// What the checks of a report share: the list that they write, and the comparisons that feed it.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_CHECKER_H
#define VOK_MEMPOOL_TOOLS_REPORT_CHECKER_H

#include "report/Check.h"
#include "report/Form.h"

#include <algorithm>
#include <fmt/format.h>
#include <string_view>

namespace VOK::MemPool::Tools {

class Checker {
public:
  std::vector<Breach> breaches;

  void Add(std::size_t line, std::string text) { breaches.push_back({line, std::move(text)}); }

  /// `expected` is what `why` comes to.
  void Equal(std::size_t line, std::string_view what, std::uint64_t found, std::uint64_t expected,
             std::string_view why) {
    if (found != expected)
      Add(line, fmt::format("{} is {}, not {}: {}", what, found, expected, why));
  }
  void Equal(std::size_t line, std::string_view what, Address found, Address expected,
             std::string_view why) {
    if (found != expected)
      Add(line, fmt::format("{} is {:#x}, not {:#x}: {}", what, found.value, expected.value, why));
  }

  /// Title against rows, and ids without a gap.
  template <class Row>
  void Table(const Tools::Table<Row>& table) {
    Equal(table.line, "the title's count", table.count, table.rows.size(), "the number of rows");
    for (std::size_t i = 0; i < table.rows.size(); ++i)
      Equal(table.LineOf(i), "Id", ValueOf(table.rows[i].id), i + 1, "ids have no gap");
  }

  static Number ValueOf(Number number) { return number; }
  static Number ValueOf(Id id) { return id.value; }
};

/// Visits a header block for the line of one label.
struct LabelFinder {
  std::string_view label;
  std::size_t line; ///< of the present label; at first of the one in front of the block
  std::size_t found = 0;

  template <class Value>
  void Line(const char* text, const char*, const Value&) {
    ++line;
    if (text == label) found = line;
  }
};

/// The line of a label in the header block that begins behind line `title`.
template <class Block>
std::size_t LineOf(const Block& block, std::size_t title, std::string_view label) {
  LabelFinder finder{label, title};
  VisitLines(block, finder);
  return finder.found;
}

/// The check of a report's own block and tables, and of the reports of its buckets.
void CheckPool(const Report& report, Checker& checker);
void CheckBuckets(const Report& report, Checker& checker);

} // namespace VOK::MemPool::Tools

#endif
