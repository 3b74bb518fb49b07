#include "common/Programs.h"

#include "common/Tool.h"

#include <filesystem>
#include <fmt/format.h>
#include <link.h>
#include <set>
#include <unistd.h>

extern char** environ;

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
  for (std::string& text : texts)
    pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
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
