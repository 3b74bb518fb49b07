// Runs a program and records it and its children, a file for each process.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_SESSION_H
#define VOK_MEMPOOL_TOOLS_RECORD_SESSION_H

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct RecordRequest {
  std::string file = "vokmempool.rec"; ///< of the first process; those of others are FILE.2, ...
  bool isKept = true;                  ///< else no one needs its name
  unsigned depth = 8;                  ///< of call stacks, in return addresses
  std::vector<std::string> program;    ///< with its arguments
};

/// Returns once all processes of the program have ended, with its status as a shell has it: that of
/// a signal is 128 more. What asks it to end is passed on to the program; once that has ended, it
/// ends the recording. Says on the error stream what was recorded. Fails if the program can't be
/// recorded, before it starts.
int RecordProgram(const RecordRequest& request);

} // namespace VOK::MemPool::Tools

#endif
