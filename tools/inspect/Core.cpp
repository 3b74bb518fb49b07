// The memory that a core file holds.
#include "common/Tool.h"
#include "inspect/Memory.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <fmt/format.h>
#include <gelf.h>
#include <libelf.h>
#include <memory>
#include <string_view>
#include <unistd.h>

namespace VOK::MemPool::Tools {

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
