// The grid of a record map, read: the body of its section.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_GRID_H
#define VOK_MEMPOOL_TOOLS_REPORT_GRID_H

#include "report/Lines.h"
#include "report/Model.h"

namespace VOK::MemPool::Tools {

/// Adds the grid that begins in the present line to the map, and leaves the lines behind it.
void ReadGrid(Lines& lines, Map& map);

} // namespace VOK::MemPool::Tools

#endif
