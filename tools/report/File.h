// The reports of a file, as all commands that read one take them.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_FILE_H
#define VOK_MEMPOOL_TOOLS_REPORT_FILE_H

#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// All reports of a program's output, "-" for standard input, or of a document of --json. Fails,
/// with the file in front of what is wrong, if there is none.
std::vector<Report> ReadReportFile(const std::string& file, bool isJson = false);

} // namespace VOK::MemPool::Tools

#endif
