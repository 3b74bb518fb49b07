// Other programs that a command starts, and the files that come with this one. Linux alone.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_PROGRAMS_H
#define VOK_MEMPOOL_TOOLS_COMMON_PROGRAMS_H

#include "common/Tool.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// A file beside this program: installed in a folder of the library's, else where the build made
/// it. Fails if it is missing.
std::string FindHelper(const std::string& name);

/// A folder in memory, or in the one for temporary files; it goes with the object.
class TemporaryFolder {
public:
  TemporaryFolder();
  ~TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  const std::string& GetPath() const { return path; }

private:
  std::string path;
};

/// An open file, and a path to it for this process and for those that it starts. No name in a
/// folder is left behind, however the process ends.
class HeldFile {
public:
  /// An empty one, in memory.
  HeldFile();
  /// The file `source`, to be read more than once: standard input (under the name "-") and what
  /// else isn't a regular file is copied to memory. Fails if it can't be opened.
  explicit HeldFile(const std::string& source);
  ~HeldFile();
  HeldFile(const HeldFile&) = delete;
  HeldFile& operator=(const HeldFile&) = delete;

  int GetHandle() const { return handle; }
  const std::string& GetPath() const { return path; }

private:
  int handle;
  std::string path;
};

/// The variables of this process, but for LD_PRELOAD and those with a prefix.
std::vector<std::string> Environment(std::string_view without);

/// As exec takes them. The texts must stay.
std::vector<char*> Pointers(std::vector<std::string>& texts);

/// A program that was run ended otherwise than by exit status 0. The text is the last line that it
/// wrote on its error stream, if there is one.
class ProgramFailure : public Failure {
public:
  ProgramFailure(const std::string& text, int status_) : Failure(text), status(status_) {}
  const int status; ///< as a shell has it
};

/// The status of a process as a shell has it: that of a signal is 128 more.
int ShellStatus(int waited);

/// Runs a program to its end and returns what it writes on standard output. What it writes on its
/// error stream goes to this one's, or into the ProgramFailure.
std::string RunProgram(const std::string& path, std::vector<std::string> arguments,
                       std::vector<std::string> variables);

/// Where the loader finds libraries of this machine.
std::vector<std::string> LibraryFolders();

} // namespace VOK::MemPool::Tools

#endif
