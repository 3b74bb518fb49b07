// The pools of a text over time: of its reports, or of its trace lines.
// Test: tests/tools/chart_test.py.
#ifndef VOK_MEMPOOL_TOOLS_CHART_SERIES_H
#define VOK_MEMPOOL_TOOLS_CHART_SERIES_H

#include "report/Model.h"
#include "trace/History.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct PoolSeries {
  struct Point {
    std::size_t place;                 ///< index in Series::lines
    std::optional<std::uint64_t> held; ///< bytes; a trace doesn't tell
    std::uint64_t payload;             ///< bytes; of a trace as requested
  };

  std::string name;
  std::vector<Point> points; ///< by place; the pool is there from the first one to the last one
};

struct Series {
  std::vector<std::size_t> lines; ///< of the text, one for each place
  std::vector<PoolSeries> pools;  ///< in the order in which they appear
};

/// A place is a round of reports, in which no name appears twice.
Series SeriesOf(const std::vector<Report>& reports);

/// A place is a snapshot. Two pools of one address are two series.
Series SeriesOf(const std::vector<History::Snapshot>& snapshots, const PoolNames& names);

} // namespace VOK::MemPool::Tools

#endif
