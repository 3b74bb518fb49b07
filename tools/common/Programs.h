// Other programs that a command starts, and the files that come with this one. Linux alone.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_PROGRAMS_H
#define VOK_MEMPOOL_TOOLS_COMMON_PROGRAMS_H

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// A file beside this program: installed in a folder of the library's, else where the build made
/// it. Fails if it is missing.
std::string FindHelper(const std::string& name);

/// A folder in memory, or the one for temporary files, with a name for mkstemp or mkdtemp.
std::string TemporaryName();

/// A folder with such a name; it goes with the object.
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

/// The variables of this process, but for LD_PRELOAD and those with a prefix.
std::vector<std::string> Environment(std::string_view without = {});

/// As exec takes them. The texts must stay.
std::vector<char*> Pointers(std::vector<std::string>& texts);

/// Runs a program to its end and returns what it writes on standard output. Fails unless it exits
/// with status 0.
std::string RunProgram(const std::string& path, std::vector<std::string> arguments,
                       std::vector<std::string> variables);

/// Where the loader finds libraries of this machine.
std::vector<std::string> LibraryFolders();

} // namespace VOK::MemPool::Tools

#endif
