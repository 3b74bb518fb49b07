// The pools of a text side by side: what each holds, what of that its callers use, and what has
// changed since an earlier text; for people, for Prometheus and for a spreadsheet.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_SUMMARY_H
#define VOK_MEMPOOL_TOOLS_REPORT_SUMMARY_H

#include "report/Model.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct Bytes {
  std::uint64_t held = 0;    ///< heap blocks of buckets and ext records, with their headers
  std::uint64_t payload = 0; ///< data bytes of used records
};

Bytes BytesOf(const Report& report);

/// A table with a row for each report; `marks` ends the rows. Their lines come first where a pool
/// has several reports.
std::string Summarise(const std::vector<Report>& reports,
                      const std::vector<std::string>& marks = {});

/// The figures of each pool in Prometheus' text format, with its name as label. Of several reports
/// of a name the last counts.
std::string PrometheusText(const std::vector<Report>& reports);

/// A row for each report as CSV, with its line, under a row of headings.
std::string SeriesText(const std::vector<Report>& reports);

/// The same as a JSON array of objects.
std::string SeriesJson(const std::vector<Report>& reports);

/// A line for each pool that differs, by name, and below it one for each of its record sizes. Of
/// several reports of a name the last counts. `showsRecords` adds each record that came into use or
/// went out of it, by address, as far as the reports have them. Empty if nothing differs.
std::string Difference(const std::vector<Report>& before, const std::vector<Report>& now,
                       bool showsRecords);

} // namespace VOK::MemPool::Tools

#endif
