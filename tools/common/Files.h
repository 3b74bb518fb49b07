// The file that a command reads, and the stream or file that it writes.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_FILES_H
#define VOK_MEMPOOL_TOOLS_COMMON_FILES_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

/// What messages call a file: "-" is standard input.
std::string NameOfFile(const std::string& path);

/// A file to read, or standard input under the name "-".
class Input {
public:
  /// Fails if it can't be opened.
  explicit Input(const std::string& path);

  /// Reads up to `size` bytes, fewer only at the end. Fails if that can't be done.
  std::size_t Read(char* to, std::size_t size);

  std::string ReadAll();

  /// The size of a regular file, 0 of anything else.
  std::uint64_t GetSize() const { return size; }

private:
  struct Closer {
    void operator()(std::FILE* file) const;
  };

  std::string name;
  std::unique_ptr<std::FILE, Closer> file;
  std::uint64_t size = 0;
};

/// Writes on standard output. Fails if that can't be done.
void Print(std::string_view text);

/// Writes a whole file. Fails if that can't be done.
void WriteFile(const std::string& path, std::string_view text);

/// A text on one line: characters that aren't printable are shown by their code.
std::string OneLine(std::string_view text);

} // namespace VOK::MemPool::Tools

#endif
