// The subcommands. Each of these functions declares the arguments of one, and what runs once they
// are read. A subcommand that can't do its work throws a Failure.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_COMMANDS_H
#define VOK_MEMPOOL_TOOLS_COMMON_COMMANDS_H

namespace CLI {
class App;
}

namespace VOK::MemPool::Tools {

void AddReport(CLI::App& app);
void AddPicture(CLI::App& app);
void AddTrace(CLI::App& app);
void AddChart(CLI::App& app);
void AddInspect(CLI::App& app);

} // namespace VOK::MemPool::Tools

#endif
