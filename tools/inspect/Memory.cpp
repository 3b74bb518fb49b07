#include "inspect/Memory.h"

#include "common/Tool.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fmt/format.h>
#include <fstream>
#include <gelf.h>
#include <libelf.h>
#include <memory>
#include <set>
#include <sstream>
#include <string_view>
#include <sys/ptrace.h>
#include <sys/uio.h>
#include <sys/wait.h>
#include <unistd.h>

namespace VOK::MemPool::Tools {

// Of a running process.

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
    std::string access;
    std::string unused;
    std::string file;
    words >> std::hex >> begin >> dash >> end >> access >> unused >> unused >> unused >> std::ws;
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
    std::string state;
    std::string other;
    fields >> state;
    for (int i = 0; i < 10; ++i)
      fields >> other;
    std::uint64_t user = 0;
    std::uint64_t system = 0;
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

// Of a core file.

namespace {

using ElfFile = std::shared_ptr<Elf>;

struct Segment {
  std::uint64_t begin, size;
  const char* bytes;
};

bool IsCompressed(std::string_view content) {
  const auto starts = {std::string_view("\x28\xb5\x2f\xfd"), std::string_view("\x04\x22\x4d\x18"),
                       std::string_view("\xfd"
                                        "7zXZ"),
                       std::string_view("\x1f\x8b"), std::string_view("BZh")};
  return std::ranges::any_of(starts, [&](auto start) { return content.starts_with(start); });
}

void CheckKind(Elf* elf, std::string_view content) {
  if (IsCompressed(content)) throw Failure("it is compressed; decompress it first");
  GElf_Ehdr header;
  if (elf_kind(elf) != ELF_K_ELF || gelf_getehdr(elf, &header) == nullptr ||
      header.e_type != ET_CORE)
    throw Failure("it is no core file");
  const int order = std::endian::native == std::endian::little ? ELFDATA2LSB : ELFDATA2MSB;
  if (header.e_ident[EI_DATA] != order)
    throw Failure("it is of a machine with another order of bytes");
}

/// By address. A file that was cut has less of a segment than the segment's header says.
std::vector<Segment> FindSegments(Elf* elf, std::string_view content) {
  std::vector<Segment> segments;
  std::size_t count = 0;
  if (elf_getphdrnum(elf, &count) != 0) return {};
  for (int i = 0; static_cast<std::size_t>(i) < count; ++i) {
    GElf_Phdr header;
    if (gelf_getphdr(elf, i, &header) == nullptr) break;
    if (header.p_type != PT_LOAD || header.p_offset >= content.size()) continue;
    const std::uint64_t size =
        std::min<std::uint64_t>(header.p_filesz, content.size() - header.p_offset);
    segments.push_back({header.p_vaddr, size, content.data() + header.p_offset});
  }
  std::ranges::sort(segments, {}, &Segment::begin);
  return segments;
}

/// Piece by piece, since neighbouring mappings are segments of their own.
bool Read(const std::vector<Segment>& segments, std::uint64_t address, char* to, std::size_t size) {
  while (size > 0) {
    auto segment = std::ranges::upper_bound(segments, address, {}, &Segment::begin);
    if (segment == segments.begin()) return false;
    --segment;
    const std::uint64_t at = address - segment->begin;
    if (at >= segment->size) return false;
    const std::size_t piece = std::min<std::uint64_t>(size, segment->size - at);
    std::memcpy(to, segment->bytes + at, piece);
    address += piece;
    to += piece;
    size -= piece;
  }
  return true;
}

Memory MemoryOf(const ElfFile& elf) {
  std::size_t size = 0;
  const char* const bytes = elf != nullptr ? elf_rawfile(elf.get(), &size) : nullptr;
  if (bytes == nullptr) throw Failure("it is no core file");
  const std::string_view content(bytes, size);
  CheckKind(elf.get(), content);
  const std::vector<Segment> segments = FindSegments(elf.get(), content);
  Memory memory;
  for (const Segment& segment : segments)
    memory.ranges.push_back({segment.begin, segment.size});
  memory.read = [elf, segments](std::uint64_t address, void* to, std::size_t count) {
    return Read(segments, address, static_cast<char*>(to), count);
  };
  return memory;
}

} // namespace

Memory MemoryOfCore(char* content, std::size_t size) {
  elf_version(EV_CURRENT);
  return MemoryOf(ElfFile(elf_memory(content, size), elf_end));
}

Memory MemoryOfCore(const std::string& path) {
  elf_version(EV_CURRENT);
  const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (file < 0) throw Failure(fmt::format("can't be opened: {}", std::strerror(errno)));
  const ElfFile elf(elf_begin(file, ELF_C_READ_MMAP, nullptr), [file](Elf* opened) {
    elf_end(opened);
    close(file);
  });
  return MemoryOf(elf);
}

} // namespace VOK::MemPool::Tools
