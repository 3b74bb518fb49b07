// Whether a report is consistent: each sum and each cross-reference that its text allows.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_CHECK_H
#define VOK_MEMPOOL_TOOLS_REPORT_CHECK_H

#include "report/Model.h"

#include <cstddef>
#include <cstdint>
#include <fmt/format.h>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VOK::MemPool::Tools {

/// What an inconsistency is about. The indices are those of BUCKETS, which are those of the
/// buckets' reports, and of a bucket's ALL RECORDS; a place of the whole pool or bucket has none.
struct Place {
  std::size_t line = 0;
  std::optional<std::size_t> bucket = std::nullopt;
  std::optional<std::size_t> record = std::nullopt;
};

struct Inconsistency {
  Place place;
  std::string text;
};

/// The inconsistencies of a report by line. A report of an undamaged pool has none.
std::vector<Inconsistency> CheckReport(const Report& report);

/// How many inconsistencies the reports have, "1 inconsistency" for one; empty for none.
std::string CountInconsistencies(const std::vector<Report>& reports);

/// Prints the inconsistencies of all reports with their lines, or that there are none. Returns what
/// CountInconsistencies does.
std::string PrintInconsistencies(const std::vector<Report>& reports);

// What the parts of the check share.

/// The list that they write, and the comparisons that feed it.
class Checker {
public:
  std::vector<Inconsistency> found;

  void Add(const Place& place, std::string text) { found.push_back({place, std::move(text)}); }

  /// `why` says where the expected value comes from.
  void Equal(const Place& place, std::string_view what, std::uint64_t value, std::uint64_t expected,
             std::string_view why) {
    if (value != expected)
      Add(place, fmt::format("{} is {}, not {}: {}", what, value, expected, why));
  }
  void Equal(const Place& place, std::string_view what, Address value, Address expected,
             std::string_view why) {
    if (value != expected)
      Add(place, fmt::format("{} is {:#x}, not {:#x}: {}", what, value.value, expected.value, why));
  }

  /// The id of the row with this index.
  void RowId(const Place& place, Number id, std::size_t row) {
    Equal(place, "Id", id, row + 1, "ids have no gap");
  }
};

/// Checks the reports of the buckets.
void CheckBuckets(const Report& report, Checker& checker);

} // namespace VOK::MemPool::Tools

#endif
