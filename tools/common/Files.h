// The file that a command reads, with its progress, and the stream or file that it writes.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_FILES_H
#define VOK_MEMPOOL_TOOLS_COMMON_FILES_H

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

/// What messages call a file: "-" is standard input.
std::string NameOfFile(const std::string& path);

/// What pages call it: without its folder.
std::string ShortNameOfFile(const std::string& path);

/// A file to read, or standard input under the name "-".
class Input {
public:
  /// Fails if it can't be opened.
  explicit Input(const std::string& path);

  /// Reads up to `count` bytes, fewer only at the end. Fails if that can't be done.
  std::size_t Read(char* to, std::size_t count);

  std::string ReadAll();

  /// The size of a regular file, 0 of anything else.
  std::uint64_t GetSize() const { return size; }

private:
  struct Closer {
    void operator()(std::FILE* open) const;
  };

  std::string name;
  std::unique_ptr<std::FILE, Closer> file;
  std::uint64_t size = 0;
};

/// A bar for long work. It appears on the error stream after two seconds, if that is a terminal,
/// and is removed with the object.
class Progress {
public:
  /// `total` units of the work are to be done, 0 if unknown; each shown one is `scale` of them.
  explicit Progress(std::uint64_t total, const char* unit = "MB", std::uint64_t scale = 1000000);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void Add(std::uint64_t units);

private:
  using Clock = std::chrono::steady_clock;

  void Show() const;

  const std::uint64_t total;
  const char* const unit;
  const std::uint64_t scale;
  const bool isTerminal;
  std::uint64_t done = 0;
  Clock::time_point due = Clock::now() + std::chrono::seconds(2);
  bool isShown = false;
};

/// Writes on standard output. Fails if that can't be done.
void Print(std::string_view text);

/// Writes a whole file, or on standard output under the name "-". Fails if that can't be done.
void WriteFile(const std::string& path, std::string_view text);

/// A text on one line: characters that aren't printable are shown by their code.
std::string OneLine(std::string_view text);

} // namespace VOK::MemPool::Tools

#endif
