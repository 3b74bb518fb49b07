// Two texts of reports of one process side by side: what came, grew, shrank and went.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_DIFFERENCE_H
#define VOK_MEMPOOL_TOOLS_REPORT_DIFFERENCE_H

#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// A line for each pool that differs, by name, and below it one for each of its record sizes. Of
/// several reports of a name the last counts. `showsRecords` adds each record that came into use or
/// went out of it, by address, as far as the reports have them. Empty if nothing differs.
std::string Difference(const std::vector<Report>& before, const std::vector<Report>& now,
                       bool showsRecords);

} // namespace VOK::MemPool::Tools

#endif
