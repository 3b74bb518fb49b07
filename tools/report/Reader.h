// From the lines of a text to the reports in it.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_READER_H
#define VOK_MEMPOOL_TOOLS_REPORT_READER_H

#include "report/Lines.h"
#include "report/Model.h"

#include <cstddef>
#include <optional>

namespace VOK::MemPool::Tools {

/// Takes the next report, nothing if there is none; `title` becomes the line of its title. Throws
/// LineFailure, and then the lines are inside the report.
std::optional<Report> TakeReport(Lines& lines, std::size_t& title);

} // namespace VOK::MemPool::Tools

#endif
