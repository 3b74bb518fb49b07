// The process's two text streams, from the one unit that includes <iostream>: every such unit has
// an initialiser of its own, and the library is to have a single one.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_OUTPUT_H
#define VOK_MEMPOOL_OUTPUT_H

#include <iosfwd>

namespace VOK::MemPool {

std::ostream& StandardOutput();
std::ostream& StandardError();

} // namespace VOK::MemPool

#endif
