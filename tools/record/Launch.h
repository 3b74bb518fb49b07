// Starts a program with the recorder's library before its allocator.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_LAUNCH_H
#define VOK_MEMPOOL_TOOLS_RECORD_LAUNCH_H

#include <string>
#include <sys/types.h>
#include <vector>

namespace VOK::MemPool::Tools {

/// The file of a command. Fails if there is none, or if no library can be preloaded into it.
std::string FindProgram(const std::string& command);

/// Starts it. From then on the recorder leaves the signals of the terminal to the program, and
/// passes on what asks it to end.
pid_t Launch(const std::string& program, std::vector<std::string> arguments,
             const std::string& rings, unsigned depth);

} // namespace VOK::MemPool::Tools

#endif
