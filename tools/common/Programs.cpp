#include "common/Programs.h"

#include "common/Tool.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fmt/format.h>
#include <link.h>
#include <set>
#include <spawn.h>
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

std::string TemporaryName() {
  const bool hasMemory = access("/dev/shm", W_OK) == 0;
  return (hasMemory ? fs::path("/dev/shm") : fs::temp_directory_path()) / "vokmempool.XXXXXX";
}

TemporaryFolder::TemporaryFolder() {
  path = TemporaryName();
  if (mkdtemp(path.data()) == nullptr)
    throw Failure(fmt::format("{}: can't be made: {}", path, std::strerror(errno)));
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code ignored;
  fs::remove_all(path, ignored);
}

std::vector<std::string> Environment(std::string_view without) {
  std::vector<std::string> variables;
  for (char** variable = environ; *variable != nullptr; ++variable) {
    const std::string_view text = *variable;
    if (text.starts_with("LD_PRELOAD=") || (!without.empty() && text.starts_with(without)))
      continue;
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

std::string RunProgram(const std::string& path, std::vector<std::string> arguments,
                       std::vector<std::string> variables) {
  int ends[2];
  if (pipe(ends) != 0) throw Failure(fmt::format("no pipe: {}", std::strerror(errno)));
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
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
  if (status != 0) throw Failure(fmt::format("{}: ended with status {}", path, status));
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
