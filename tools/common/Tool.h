// What all subcommands share: how one is added, and how it fails.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_TOOL_H
#define VOK_MEMPOOL_TOOLS_COMMON_TOOL_H

#include <stdexcept>

namespace CLI {
class App;
}

namespace VOK::MemPool::Tools {

/// What ends a command: one line for the error stream, and exit status 1.
class Failure : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};

/// What ends a command with a status that isn't its own.
struct ExitStatus {
  int status;
};

// Each of these functions declares the arguments of a subcommand, and what runs once they are read.

void AddReport(CLI::App& app);
void AddPicture(CLI::App& app);
void AddTrace(CLI::App& app);
void AddChart(CLI::App& app);
void AddInspect(CLI::App& app);
void AddTop(CLI::App& app);
void AddRecord(CLI::App& app);
void AddAdvise(CLI::App& app);
void AddReplay(CLI::App& app);

} // namespace VOK::MemPool::Tools

#endif
