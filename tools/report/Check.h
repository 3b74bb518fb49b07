// Whether a report agrees with itself: each sum and each cross-reference that its text allows.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_CHECK_H
#define VOK_MEMPOOL_TOOLS_REPORT_CHECK_H

#include "report/Model.h"

#include <cstddef>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct Breach {
  std::size_t line;
  std::string text;
};

/// The breaches of a report by line. A report of an undamaged pool has none.
std::vector<Breach> CheckReport(const Report& report);

} // namespace VOK::MemPool::Tools

#endif
