// What ends a command: one line for the error stream, and exit status 1.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_FAILURE_H
#define VOK_MEMPOOL_TOOLS_COMMON_FAILURE_H

#include <stdexcept>

namespace VOK::MemPool::Tools {

class Failure : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};

} // namespace VOK::MemPool::Tools

#endif
