// The memory of another process, running or dumped.
#ifndef VOK_MEMPOOL_TOOLS_INSPECT_MEMORY_H
#define VOK_MEMPOOL_TOOLS_INSPECT_MEMORY_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct Memory {
  struct Range {
    std::uint64_t begin, size;
  };

  /// Copies so many bytes; false if not all of them can be read.
  std::function<bool(std::uint64_t address, void* to, std::size_t size)> read;
  std::vector<Range> ranges; ///< those in which a module's data can be
  bool isChanging = false;   ///< the process may be running

  /// The processor time of each thread that runs or waits for a processor, by the thread's number.
  std::function<std::map<int, std::uint64_t>()> getRunnable = [] {
    return std::map<int, std::uint64_t>();
  };
};

/// A Failure says why there is nothing to read.
Memory MemoryOfProcess(int process);
Memory MemoryOfCore(const std::string& path);

/// Of a core file's content, which must outlive the result.
Memory MemoryOfCore(char* content, std::size_t size);

/// Stops all threads of a process while it exists. The process itself can't notice it.
class Freeze {
public:
  /// Fails if that is not permitted.
  explicit Freeze(int process);
  ~Freeze();
  Freeze(const Freeze&) = delete;
  Freeze& operator=(const Freeze&) = delete;

private:
  struct Thread {
    int id, signal; ///< the signal that it was about to receive, or 0
  };

  bool Stop(int thread);

  std::vector<Thread> threads;
};

} // namespace VOK::MemPool::Tools

#endif
