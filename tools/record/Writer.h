// Writes the file of a recording.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_WRITER_H
#define VOK_MEMPOOL_TOOLS_RECORD_WRITER_H

#include "record/Format.h"

#include <cstdio>
#include <initializer_list>
#include <memory>
#include <string>
#include <string_view>
#include <vector>
#include <zstd.h>

namespace VOK::MemPool::Tools {

class RecordingWriter {
public:
  /// Fails if the file can't be made.
  explicit RecordingWriter(const std::string& path);

  const std::string& GetPath() const { return path; }

  void Put(Entry entry, std::initializer_list<std::uint64_t> numbers, std::string_view text = {});

  /// A further number of the entry before.
  void PutNumber(std::uint64_t number);

  /// Writes what is left. Fails if anything couldn't be written.
  void Close();

private:
  struct Closer {
    void operator()(std::FILE* open) const { std::fclose(open); }
    void operator()(ZSTD_CCtx* made) const { ZSTD_freeCCtx(made); }
  };

  void WriteBlock();
  void Write(const void* data, std::size_t size);

  const std::string path;
  std::unique_ptr<std::FILE, Closer> file;
  std::unique_ptr<ZSTD_CCtx, Closer> context;
  std::string block;
  std::vector<char> stored;
};

} // namespace VOK::MemPool::Tools

#endif
