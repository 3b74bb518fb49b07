// From the output of a program to the reports in it.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_READER_H
#define VOK_MEMPOOL_TOOLS_REPORT_READER_H

#include "report/Model.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// All reports of a text, in its order; other lines are skipped. Each line of a report has to match
/// to the column: a Failure names the line and what was expected in it.
std::vector<Report> ReadReports(std::string_view text);

/// All reports of a file, "-" for standard input: a program's output, or a document of --json.
/// Fails if there is none; the file's name begins the message.
std::vector<Report> ReadReportFile(const std::string& file, bool isJson = false);

} // namespace VOK::MemPool::Tools

#endif
