// Starts a program with the recorder's library before its allocator, and waits for its end.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_LAUNCH_H
#define VOK_MEMPOOL_TOOLS_RECORD_LAUNCH_H

#include <array>
#include <csignal>
#include <string>
#include <sys/types.h>
#include <vector>

namespace VOK::MemPool::Tools {

/// The file of a command. Fails if there is none, or if no library can be preloaded into it.
std::string FindProgram(const std::string& command);

/// A program that runs, with what it starts. While the object exists the recorder leaves the
/// signals of the terminal to the program and passes on what asks it to end; once the program has
/// ended, each of them asks the recorder. Only one object may exist at a time.
class Launch {
public:
  /// Starts it. Fails if that can't be done. The rings are made in the folder `rings`.
  Launch(const std::string& program, std::vector<std::string> arguments, const std::string& rings,
         unsigned depth);
  ~Launch();
  Launch(const Launch&) = delete;
  Launch& operator=(const Launch&) = delete;

  /// Whether a process of the program is left.
  bool IsRunning();

  /// Whether a signal asked the recorder to end.
  static bool IsEndAsked();

  /// The program's, as a shell has it; 0 before its end.
  int GetStatus() const { return status; }

private:
  static constexpr std::array signals{SIGINT, SIGQUIT, SIGTERM, SIGHUP, SIGCHLD};

  std::array<void (*)(int), signals.size()> handlers{}; ///< of those signals, before
  pid_t program = 0;
  int status = 0;
};

} // namespace VOK::MemPool::Tools

#endif
