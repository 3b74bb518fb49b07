#include "record/Launch.h"

#include "common/Files.h"
#include "common/Programs.h"
#include "common/Tool.h"
#include "record/Ring.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <elf.h>
#include <filesystem>
#include <fmt/format.h>
#include <fstream>
#include <spawn.h>
#include <sstream>
#include <string_view>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace VOK::MemPool::Tools {

namespace {

namespace fs = std::filesystem;

std::string SearchPath(const std::string& command) {
  if (command.find('/') != std::string::npos) return command;
  const char* const variable = std::getenv("PATH");
  std::string_view rest = variable != nullptr ? variable : "/usr/bin:/bin";
  while (!rest.empty()) {
    const std::size_t end = std::min(rest.find(':'), rest.size());
    const fs::path path = fs::path(end == 0 ? "." : rest.substr(0, end)) / command;
    if (access(path.c_str(), X_OK) == 0 && !fs::is_directory(path)) return path;
    rest.remove_prefix(std::min(end + 1, rest.size()));
  }
  throw Failure(fmt::format("{}: no such program", OneLine(command)));
}

bool HasInterpreter(std::ifstream& file, const Elf64_Ehdr& header) {
  for (unsigned i = 0; i < header.e_phnum; ++i) {
    Elf64_Phdr segment{};
    file.seekg(static_cast<std::streamoff>(header.e_phoff + i * header.e_phentsize));
    if (!file.read(reinterpret_cast<char*>(&segment), sizeof segment)) return false;
    if (segment.p_type == PT_INTERP) return true;
  }
  return false;
}

/// The program that runs a script, empty if the file isn't one.
std::string InterpreterOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::string line;
  if (!std::getline(file, line) || !line.starts_with("#!")) return {};
  const std::size_t begin = std::min(line.find_first_not_of(" \t", 2), line.size());
  return line.substr(begin, line.find_first_of(" \t", begin) - begin);
}

constexpr int maxInterpreters = 4; // one of the other, as the kernel has it

/// Fails if the loader wouldn't preload a library into the program.
void CheckPreload(const std::string& path, int level = 0) {
  struct stat state {};
  if (stat(path.c_str(), &state) != 0 || access(path.c_str(), X_OK) != 0)
    throw Failure(fmt::format("{}: can't be run: {}", path, std::strerror(errno)));
  if (const std::string interpreter = InterpreterOf(path); !interpreter.empty())
    return level < maxInterpreters ? CheckPreload(interpreter, level + 1)
                                   : throw Failure(path + ": has too many interpreters");
  if ((state.st_mode & (S_ISUID | S_ISGID)) != 0 ||
      getxattr(path.c_str(), "security.capability", nullptr, 0) > 0)
    throw Failure(
        fmt::format("{}: runs with other rights than the caller's, so that no library can "
                    "be preloaded",
                    path));
  std::ifstream file(path, std::ios::binary);
  Elf64_Ehdr header{};
  if (!file.read(reinterpret_cast<char*>(&header), sizeof header) ||
      std::memcmp(header.e_ident, ELFMAG, SELFMAG) != 0)
    throw Failure(fmt::format("{}: isn't a program", path));
  if (header.e_ident[EI_CLASS] != ELFCLASS64)
    throw Failure(fmt::format("{}: is a 32-bit program; only 64-bit ones can be recorded", path));
  if (!HasInterpreter(file, header))
    throw Failure(
        fmt::format("{}: is linked statically, so that no library can be preloaded", path));
}

volatile sig_atomic_t running = 0; // the program
volatile sig_atomic_t isEndAsked = 0;

void TakeSignal(int signal) {
  if (running == 0)
    isEndAsked = 1;
  else if (signal == SIGTERM || signal == SIGHUP) // the terminal sends the others to both
    kill(running, signal);
}

constexpr std::string_view library = "libvokmempool-record.so";

/// The library's path as LD_PRELOAD can have it, which takes blanks and colons for ends.
std::string PathToPreload(const std::string& folder) {
  const std::string path = FindHelper(std::string(library));
  if (path.find_first_of(" :") == std::string::npos) return path;
  const fs::path link = fs::path(folder) / library;
  fs::create_symlink(path, link);
  return link;
}

/// What is preloaded, with the recorder's library first. In a recorder that is recorded itself
/// there is one already, which would record the program a second time.
std::string Preloads(const std::string& folder) {
  std::string all = PathToPreload(folder);
  const char* const variable = std::getenv("LD_PRELOAD");
  std::istringstream others(variable != nullptr ? variable : "");
  for (std::string other; std::getline(others, other, ':');)
    if (!other.ends_with(library)) all += ":" + other;
  return all;
}

} // namespace

std::string FindProgram(const std::string& command) {
  std::string path = SearchPath(command);
  CheckPreload(path);
  return path;
}

Launch::Launch(const std::string& path, std::vector<std::string> arguments,
               const std::string& rings, unsigned depth) {
  std::vector<std::string> variables = Environment(Record::variables);
  variables.push_back("LD_PRELOAD=" + Preloads(rings));
  variables.push_back(fmt::format("{}={}", Record::folderVariable, rings));
  variables.push_back(fmt::format("{}={} {}", Record::settingVariable, depth, getpid()));

  isEndAsked = 0;
  handlers.back() = std::signal(SIGCHLD, SIG_DFL); // an inherited SIG_IGN would hide the end
  prctl(PR_SET_CHILD_SUBREAPER, 1); // the recorder waits for what outlives its parent, too
  const int error = posix_spawn(&program, path.c_str(), nullptr, nullptr,
                                Pointers(arguments).data(), Pointers(variables).data());
  if (error != 0) throw Failure(fmt::format("{}: can't be run: {}", path, std::strerror(error)));
  running = program;
  for (std::size_t i = 0; signals[i] != SIGCHLD; ++i)
    handlers[i] = std::signal(signals[i], TakeSignal);
}

Launch::~Launch() {
  for (std::size_t i = 0; i < signals.size(); ++i)
    std::signal(signals[i], handlers[i]);
  prctl(PR_SET_CHILD_SUBREAPER, 0);
}

bool Launch::IsRunning() {
  int waited = 0;
  pid_t ended = 0;
  while ((ended = waitpid(-1, &waited, WNOHANG)) > 0)
    if (ended == program) {
      running = 0;
      status = ShellStatus(waited);
    }
  return ended == 0;
}

bool Launch::IsEndAsked() { return isEndAsked != 0; }

} // namespace VOK::MemPool::Tools
