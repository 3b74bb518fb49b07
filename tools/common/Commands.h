// The subcommands, each in a source of its own: it declares its arguments, and what runs once they
// are read. A subcommand ends in a Failure or does what it was asked.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_COMMANDS_H
#define VOK_MEMPOOL_TOOLS_COMMON_COMMANDS_H

namespace CLI {
class App;
}

namespace VOK::MemPool::Tools {

void AddReport(CLI::App& app);
void AddPicture(CLI::App& app);
void AddTrace(CLI::App& app);

} // namespace VOK::MemPool::Tools

#endif
