// Hostile bytes for the reader of recordings: it refuses them or reads events that hold together.
// Bytes that don't begin as a recording are the entries of one block, since no fuzzer finds a
// checksum.
#include "Target.h"
#include "common/Tool.h"
#include "record/Reader.h"

#include <cstdlib>
#include <string>
#include <zstd.h>

using namespace VOK::MemPool::Tools;

namespace {

std::string LittleEndian(std::size_t number) {
  std::string bytes;
  for (int i = 0; i < 4; ++i, number >>= 8)
    bytes += static_cast<char>(number & 0xff);
  return bytes;
}

std::string FileOf(std::string input) {
  if (input.starts_with(recordingMagic)) return input;
  std::string stored(ZSTD_compressBound(input.size()), 0);
  stored.resize(ZSTD_compress(stored.data(), stored.size(), input.data(), input.size(), 1));
  return std::string(recordingMagic) + LittleEndian(recordingVersion) +
         LittleEndian(stored.size()) + LittleEndian(input.size()) + stored;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string file = FileOf(std::string(reinterpret_cast<const char*>(data), size));
  std::size_t at = 0;
  const auto source = [&](char* to, std::size_t most) {
    const std::size_t part = file.copy(to, most, at);
    at += part;
    return part;
  };
  try {
    Recording recording("fuzz", source);
    std::uint64_t blocks = 0;
    std::uint64_t time = 0;
    for (RecordedEvent event; recording.Next(event); time = event.time) {
      if (event.IsRequest()) ++blocks;
      if (event.block > blocks || event.old > blocks || event.time < time ||
          event.stack >= recording.stacks.size())
        std::abort();
    }
    for (const RecordedStack& stack : recording.stacks)
      if (stack.modules >= recording.modules.size()) std::abort();
  } catch (const Failure&) {
  }
  return 0;
}
