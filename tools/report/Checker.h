// What the checks of a report share: the list that they write, and the comparisons that feed it.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_CHECKER_H
#define VOK_MEMPOOL_TOOLS_REPORT_CHECKER_H

#include "report/Check.h"

#include <cstdint>
#include <fmt/format.h>
#include <string_view>
#include <utility>

namespace VOK::MemPool::Tools {

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

/// Checks the pool's own block and tables.
void CheckPool(const Report& report, Checker& checker);

/// Checks the reports of the buckets.
void CheckBuckets(const Report& report, Checker& checker);

} // namespace VOK::MemPool::Tools

#endif
