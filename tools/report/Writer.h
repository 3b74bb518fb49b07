// From data back to the text of a report, as the library prints it.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_WRITER_H
#define VOK_MEMPOOL_TOOLS_REPORT_WRITER_H

#include "report/Model.h"

#include <string>

namespace VOK::MemPool::Tools {

std::string WriteReport(const Report& report);

} // namespace VOK::MemPool::Tools

#endif
