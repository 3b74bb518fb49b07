#include "record/Writer.h"

#include "common/Tool.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

namespace {

std::array<unsigned char, 4> LittleEndian(std::size_t number) {
  std::array<unsigned char, 4> bytes{};
  for (unsigned char& byte : bytes) {
    byte = static_cast<unsigned char>(number & 0xff);
    number >>= 8;
  }
  return bytes;
}

} // namespace

RecordingWriter::RecordingWriter(const std::string& path_)
    : path(path_), file(std::fopen(path.c_str(), "wbe")), context(ZSTD_createCCtx()) {
  if (!file) throw Failure(fmt::format("{}: can't be opened: {}", path, std::strerror(errno)));
  if (!context) throw Failure("no memory to compress the recording");
  ZSTD_CCtx_setParameter(context.get(), ZSTD_c_compressionLevel, 1);
  ZSTD_CCtx_setParameter(context.get(), ZSTD_c_checksumFlag, 1);
  Write(recordingMagic.data(), recordingMagic.size());
  Write(LittleEndian(recordingVersion).data(), 4);
}

void RecordingWriter::Put(Entry entry, std::initializer_list<std::uint64_t> numbers,
                          std::string_view text) {
  if (block.size() >= blockBytes) WriteBlock();
  block += static_cast<char>(entry);
  for (const std::uint64_t number : numbers)
    PutNumber(number);
  block += text;
}

void RecordingWriter::PutNumber(std::uint64_t number) {
  constexpr unsigned bits = 7;
  constexpr std::uint64_t more = 1 << bits;
  for (; number >= more; number >>= bits)
    block += static_cast<char>(number | more);
  block += static_cast<char>(number);
}

void RecordingWriter::Close() {
  WriteBlock();
  if (std::fclose(file.release()) != 0)
    throw Failure(fmt::format("{}: can't be written: {}", path, std::strerror(errno)));
}

void RecordingWriter::WriteBlock() {
  stored.resize(ZSTD_compressBound(block.size()));
  const std::size_t size =
      ZSTD_compress2(context.get(), stored.data(), stored.size(), block.data(), block.size());
  if (ZSTD_isError(size) != 0)
    throw Failure(fmt::format("{}: can't be compressed: {}", path, ZSTD_getErrorName(size)));
  Write(LittleEndian(size).data(), 4);
  Write(LittleEndian(block.size()).data(), 4);
  Write(stored.data(), size);
  block.clear();
}

void RecordingWriter::Write(const void* data, std::size_t size) {
  if (std::fwrite(data, 1, size, file.get()) != size)
    throw Failure(fmt::format("{}: can't be written: {}", path, std::strerror(errno)));
}

} // namespace VOK::MemPool::Tools
