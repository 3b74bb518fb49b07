#include "common/Programs.h"

#include "common/Files.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fmt/format.h>
#include <fstream>
#include <link.h>
#include <set>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

namespace VOK::MemPool::Tools {

namespace fs = std::filesystem;

std::string FindHelper(const std::string& name) {
  const fs::path folder = fs::read_symlink("/proc/self/exe").parent_path();
  for (const fs::path& path : {folder / VOK_MEMPOOL_HELPERS / name, folder / name})
    if (fs::exists(path)) return fs::canonical(path);
  throw Failure(fmt::format("{} is missing beside this program", name));
}

TemporaryFolder::TemporaryFolder() {
  const bool hasMemory = access("/dev/shm", W_OK) == 0;
  path = (hasMemory ? fs::path("/dev/shm") : fs::temp_directory_path()) / "vokmempool.XXXXXX";
  if (mkdtemp(path.data()) == nullptr)
    throw Failure(fmt::format("{}: can't be made: {}", path, std::strerror(errno)));
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code ignored;
  fs::remove_all(path, ignored);
}

HeldFile::HeldFile()
    : handle(memfd_create("vokmempool", 0)), path(fmt::format("/proc/self/fd/{}", handle)) {
  if (handle < 0)
    throw Failure(fmt::format("no file can be made in memory: {}", std::strerror(errno)));
}

HeldFile::HeldFile(const std::string& source) : HeldFile() {
  if (source != "-" && fs::is_regular_file(source)) {
    const int file = open(source.c_str(), O_RDONLY | O_CLOEXEC);
    if (file < 0 || dup2(file, handle) < 0) // in place of the memory
      throw Failure(fmt::format("{}: can't be opened: {}", source, std::strerror(errno)));
    close(file);
    return;
  }
  Input input(source);
  std::ofstream copy(path, std::ios::binary);
  char part[65536];
  for (std::size_t count; (count = input.Read(part, sizeof part)) > 0;)
    copy.write(part, static_cast<std::streamsize>(count));
  if (!copy.flush()) throw Failure(NameOfFile(source) + ": can't be copied to memory");
}

HeldFile::~HeldFile() { close(handle); }

std::vector<std::string> Environment(std::string_view without) {
  std::vector<std::string> variables;
  for (char** variable = environ; *variable != nullptr; ++variable) {
    const std::string_view text = *variable;
    if (text.starts_with("LD_PRELOAD=") || text.starts_with(without)) continue;
    variables.emplace_back(text);
  }
  return variables;
}

std::vector<char*> Pointers(std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  for (std::string& text : texts)
    pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

int ShellStatus(int waited) {
  return WIFSIGNALED(waited) ? 128 + WTERMSIG(waited) : WEXITSTATUS(waited);
}

namespace {

/// Why a program failed: its last line on the error stream, else its status.
std::string Explain(const std::string& path, std::string_view errors, int waited) {
  while (errors.ends_with('\n'))
    errors.remove_suffix(1);
  if (!errors.empty()) return OneLine(errors.substr(errors.rfind('\n') + 1));
  return WIFSIGNALED(waited) ? fmt::format("{}: ended by signal {}", path, WTERMSIG(waited))
                             : fmt::format("{}: ended with status {}", path, WEXITSTATUS(waited));
}

} // namespace

std::string RunProgram(const std::string& path, std::vector<std::string> arguments,
                       std::vector<std::string> variables) {
  int ends[2];
  if (pipe(ends) != 0) throw Failure(fmt::format("no pipe: {}", std::strerror(errno)));
  const HeldFile errors;
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, errors.GetHandle(), STDERR_FILENO);
  posix_spawn_file_actions_adddup2(&actions, ends[1], STDOUT_FILENO);
  posix_spawn_file_actions_addclose(&actions, ends[0]);
  posix_spawn_file_actions_addclose(&actions, ends[1]);
  pid_t child = 0;
  const int error = posix_spawn(&child, path.c_str(), &actions, nullptr, Pointers(arguments).data(),
                                Pointers(variables).data());
  posix_spawn_file_actions_destroy(&actions);
  close(ends[1]);
  std::string output;
  char part[4096];
  for (ssize_t length; error == 0 && (length = read(ends[0], part, sizeof part)) > 0;)
    output.append(part, static_cast<std::size_t>(length));
  close(ends[0]);
  int status = 0;
  if (error == 0) waitpid(child, &status, 0);
  if (error != 0) throw Failure(fmt::format("{}: can't be run: {}", path, std::strerror(error)));
  const std::string said = Input(errors.GetPath()).ReadAll();
  if (status != 0) throw ProgramFailure(Explain(path, said, status), ShellStatus(status));
  std::fwrite(said.data(), 1, said.size(), stderr);
  return output;
}

/// The folder of the C library's own file is the first of them.
std::vector<std::string> LibraryFolders() {
  std::set<std::string> folders;
  dl_iterate_phdr(
      [](dl_phdr_info* info, std::size_t, void* found) {
        const fs::path path = info->dlpi_name;
        if (path.filename().string().starts_with("libc.so"))
          static_cast<std::set<std::string>*>(found)->insert(fs::canonical(path).parent_path());
        return 0;
      },
      &folders);
  folders.insert({"/usr/lib", "/usr/local/lib"});
  return {folders.begin(), folders.end()};
}

} // namespace VOK::MemPool::Tools
