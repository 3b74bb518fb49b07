// The file of a recording: an opening, then blocks of entries. docs/recording.md describes it.
//
//   opening: "VOKMPREC", version (4 bytes)
//   block:   stored size (4 bytes), plain size (4 bytes), a zstd frame of the entries
//   entry:   its kind (1 byte), then numbers as LEB128, then the bytes of a text
//
// Fixed numbers are little-endian. A block ends with an entry, so that each block that is whole can
// be read. Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_FORMAT_H
#define VOK_MEMPOOL_TOOLS_RECORD_FORMAT_H

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace VOK::MemPool::Tools {

constexpr std::string_view recordingMagic = "VOKMPREC";
constexpr std::uint32_t recordingVersion = 1;

/// A block is written once it has this many bytes; no reader needs to accept a larger one than
/// most.
constexpr std::size_t blockBytes = 1 << 20, mostBlockBytes = 1 << 24;

enum class Entry : std::uint8_t {
  End,         ///< events, lost events
  Process,     ///< process, its parent, depth of stacks
  Executable,  ///< length, path
  Command,     ///< length, arguments, each with its 0
  Module,      ///< address, length, path
  Unload,      ///< the modules that follow are all
  Stack,       ///< return addresses; each as zigzag difference to the one before. Numbered from 1
  Thread,      ///< thread that made the following events
  Time,        ///< microseconds since the entry before
  Malloc = 16, ///< size, stack. These four and Realloc number the blocks from 1
  Calloc,
  Aligned,     ///< size, stack, log2(alignment)
  Realloc,     ///< distance, size, stack; a distance is the number of the last block less its own
  Free,        ///< distance
  FreeUnknown, ///< of a block that was allocated before the recording
};

constexpr std::uint64_t mostFrames = 64, mostText = 4096;

} // namespace VOK::MemPool::Tools

#endif
