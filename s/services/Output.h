// The process's two text streams, from the one unit that includes <iostream>: every such unit has
// an initialiser of its own, and the library is to have a single one. And a line on the first.
// Test: tests/process_test.py.
#ifndef VOK_MEMPOOL_OUTPUT_H
#define VOK_MEMPOOL_OUTPUT_H

#include <ostream>

namespace VOK::MemPool {

std::ostream& StandardOutput();
std::ostream& StandardError();

/// Standard output for one line of trace or message, under the format state that it is in. What
/// can't be written is lost without a word, also where the program has told the stream to throw:
/// the operation that tells of itself goes on. Takes nothing from the heap.
class OutputLine {
public:
  OutputLine();

  /// What to write on; the line ends with std::endl.
  std::ostream& Stream() { return os; }

private:
  std::ostream os;
};

} // namespace VOK::MemPool

#endif
