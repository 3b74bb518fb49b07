#include "inspect/Library.h"

#include <algorithm>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

namespace {

/// No structure and no table of size classes is larger.
constexpr std::uint32_t maxStructure = 8 * 65536;

/// The description at an address, which a copy of one is not.
template <class Pointer>
std::optional<LayoutOf<std::uint64_t>> ReadLayout(const Memory& memory, std::uint64_t address) {
  LayoutOf<Pointer> found;
  if (!memory.read(address, &found, sizeof found)) return std::nullopt;
  if (found.self != address || found.pointerSize != sizeof(Pointer)) return std::nullopt;
  if (found.format != layoutFormat)
    throw Failure(fmt::format("its library describes its layout in form {}, and this program reads "
                              "form {}",
                              found.format, layoutFormat));
  LayoutOf<std::uint64_t> layout{
      {}, found.format, found.pointerSize, found.self, found.first, found.structures, {}};
  std::ranges::copy(found.version, layout.version);
  std::ranges::replace(layout.version, '\n', ' ');
  layout.version[sizeof layout.version - 1] = '\0';
  return layout;
}

/// The descriptions in a piece of memory, of which `bytes` is a copy.
void FindLayouts(const Memory& memory, std::uint64_t begin, const std::vector<char>& bytes,
                 std::vector<Library>& libraries) {
  constexpr std::size_t alignment = 4;
  for (std::size_t at = (0 - begin) % alignment; at + sizeof layoutMagic <= bytes.size();
       at += alignment) {
    if (std::memcmp(bytes.data() + at, layoutMagic, sizeof layoutMagic) != 0) continue;
    auto layout = ReadLayout<std::uint64_t>(memory, begin + at);
    if (!layout) layout = ReadLayout<std::uint32_t>(memory, begin + at);
    if (layout) libraries.push_back({memory, *layout});
  }
}

} // namespace

std::optional<Structure> Library::Fetch(std::uint64_t address, std::uint32_t size) const {
  if (size > maxStructure) return std::nullopt;
  std::vector<char> bytes(size);
  if (!memory.read(address, bytes.data(), size)) return std::nullopt;
  return Structure(address, std::move(bytes), layout.pointerSize);
}

std::vector<Library> FindLibraries(const Memory& memory) {
  constexpr std::uint64_t piece = 1 << 20;
  constexpr std::uint64_t overlap = sizeof layoutMagic - 1;
  std::vector<Library> libraries;
  std::vector<char> bytes;
  for (const Memory::Range& range : memory.ranges)
    for (std::uint64_t at = 0; at < range.size; at += piece) {
      bytes.resize(std::min(piece + overlap, range.size - at));
      if (memory.read(range.begin + at, bytes.data(), bytes.size()))
        FindLayouts(memory, range.begin + at, bytes, libraries);
    }
  return libraries;
}

} // namespace VOK::MemPool::Tools
