// The memory of a running process.
#include "common/Tool.h"
#include "inspect/Memory.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fmt/format.h>
#include <fstream>
#include <set>
#include <sstream>
#include <sys/ptrace.h>
#include <sys/uio.h>
#include <sys/wait.h>

namespace VOK::MemPool::Tools {

namespace {

[[noreturn]] void Refuse(int error) {
  if (error == ENOENT || error == ESRCH) throw Failure("there is no such process");
  if (error == EPERM || error == EACCES)
    throw Failure("not permitted; run this as root, or as the process's user with "
                  "kernel.yama.ptrace_scope=0");
  throw Failure(fmt::format("can't be read: {}", std::strerror(error)));
}

/// The private mappings of files that are executable in part: the modules. Code is left out.
std::vector<Memory::Range> FindModules(int process) {
  std::ifstream maps(fmt::format("/proc/{}/maps", process));
  if (!maps) Refuse(errno);
  struct Mapping {
    Memory::Range range;
    std::string file;
  };
  std::vector<Mapping> mappings;
  std::set<std::string> modules;
  for (std::string line; std::getline(maps, line);) {
    std::istringstream words(line);
    std::uint64_t begin = 0;
    std::uint64_t end = 0;
    char dash = 0;
    std::string access, offset, device, node, file;
    words >> std::hex >> begin >> dash >> end >> access >> offset >> device >> node >> std::ws;
    std::getline(words, file);
    if (!file.starts_with('/') || end < begin || access.size() != 4) continue;
    if (access[2] == 'x')
      modules.insert(file);
    else if (access[0] == 'r' && access[3] == 'p')
      mappings.push_back({{begin, end - begin}, file});
  }
  std::vector<Memory::Range> ranges;
  for (const Mapping& mapping : mappings)
    if (modules.contains(mapping.file)) ranges.push_back(mapping.range);
  return ranges;
}

std::filesystem::path ThreadsOf(int process) { return fmt::format("/proc/{}/task", process); }

/// By clock ticks. A thread that ends meanwhile is left out.
std::map<int, std::uint64_t> FindRunnable(int process) {
  std::map<int, std::uint64_t> times;
  std::error_code ended;
  for (const auto& thread : std::filesystem::directory_iterator(ThreadsOf(process), ended)) {
    std::ifstream file(thread.path() / "stat");
    std::string line;
    std::getline(file, line);
    // After the name, which may hold anything: the state, 10 fields, the times of user and system.
    std::istringstream fields(line.substr(line.rfind(')') + 1));
    std::string state, other;
    fields >> state;
    for (int i = 0; i < 10; ++i)
      fields >> other;
    std::uint64_t user = 0, system = 0;
    if (fields >> user >> system && state == "R")
      times[std::stoi(thread.path().filename())] = user + system;
  }
  return times;
}

} // namespace

Memory MemoryOfProcess(int process) {
  const auto read = [process](std::uint64_t address, void* to, std::size_t size) {
    const iovec local{to, size};
    // NOLINTNEXTLINE(performance-no-int-to-ptr): an address of the other process
    const iovec remote{reinterpret_cast<void*>(static_cast<std::uintptr_t>(address)), size};
    const ssize_t copied = process_vm_readv(process, &local, 1, &remote, 1, 0);
    if (copied < 0 && errno != EFAULT && errno != EIO) Refuse(errno);
    return copied == static_cast<ssize_t>(size);
  };
  return {read, FindModules(process), true, [process] { return FindRunnable(process); }};
}

// Threads can start while others are being stopped, until none that runs is left.
Freeze::Freeze(int process) {
  try {
    for (bool isComplete = false; !isComplete;) {
      isComplete = true;
      for (const auto& entry : std::filesystem::directory_iterator(ThreadsOf(process)))
        if (Stop(std::stoi(entry.path().filename()))) isComplete = false;
    }
  } catch (const std::filesystem::filesystem_error& error) {
    Refuse(error.code().value());
  }
}

bool Freeze::Stop(int thread) {
  if (std::ranges::count(threads, thread, &Thread::id) > 0) return false;
  if (ptrace(PTRACE_SEIZE, thread, nullptr, nullptr) != 0) {
    if (errno == ESRCH) return false; // it has ended
    Refuse(errno);
  }
  threads.push_back({thread, 0});
  int status = 0;
  if (ptrace(PTRACE_INTERRUPT, thread, nullptr, nullptr) != 0 ||
      waitpid(thread, &status, __WALL) != thread)
    Refuse(errno);
  if (WIFSTOPPED(status) && status >> 16 == 0) threads.back().signal = WSTOPSIG(status);
  return true;
}

Freeze::~Freeze() {
  for (const Thread& thread : threads)
    ptrace(PTRACE_DETACH, thread.id, nullptr, thread.signal);
}

} // namespace VOK::MemPool::Tools
