// A bar on the terminal for long work.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_PROGRESS_H
#define VOK_MEMPOOL_TOOLS_COMMON_PROGRESS_H

#include <chrono>
#include <cstdint>

namespace VOK::MemPool::Tools {

/// It appears on the error stream after two seconds, if that is a terminal, and is removed with the
/// object.
class Progress {
public:
  /// `total` bytes are to be read; 0 if unknown.
  explicit Progress(std::uint64_t total);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void Add(std::uint64_t bytes);

private:
  using Clock = std::chrono::steady_clock;

  void Show() const;

  const std::uint64_t total;
  const bool isTerminal;
  std::uint64_t done = 0;
  Clock::time_point due = Clock::now() + std::chrono::seconds(2);
  bool isShown = false;
};

} // namespace VOK::MemPool::Tools

#endif
