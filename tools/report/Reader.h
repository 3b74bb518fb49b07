// From the text of a program to the reports in it.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_READER_H
#define VOK_MEMPOOL_TOOLS_REPORT_READER_H

#include "report/Model.h"

#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// All reports of a text, in its order; lines between and around them are passed over. Each line of
/// a report is taken to the column: a Failure names the line and what was expected of it.
std::vector<Report> ReadReports(std::string_view text);

} // namespace VOK::MemPool::Tools

#endif
