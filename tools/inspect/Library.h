// The library in the memory of another process: its description of itself, and copies of its
// structures.
#ifndef VOK_MEMPOOL_TOOLS_INSPECT_LIBRARY_H
#define VOK_MEMPOOL_TOOLS_INSPECT_LIBRARY_H

#include "common/Tool.h"
#include "diagnostics/Layout.h"
#include "inspect/Memory.h"

#include <cstring>
#include <optional>

namespace VOK::MemPool::Tools {

/// A copied structure.
class Structure {
public:
  std::uint64_t address = 0;

  Structure() = default;
  Structure(std::uint64_t address_, std::vector<char> bytes_, std::uint32_t pointerSize_)
      : address(address_), bytes(std::move(bytes_)), pointerSize(pointerSize_) {}

  template <class Value>
  Value Get(std::uint32_t offset) const {
    if (offset > bytes.size() || bytes.size() - offset < sizeof(Value))
      throw Failure("the library's description of its layout is damaged");
    Value value;
    std::memcpy(&value, bytes.data() + offset, sizeof value);
    return value;
  }
  std::uint64_t GetPointer(std::uint32_t offset) const {
    return pointerSize == 4 ? Get<std::uint32_t>(offset) : Get<std::uint64_t>(offset);
  }

private:
  std::vector<char> bytes;
  std::uint32_t pointerSize = 8;
};

struct Library {
  const Memory& memory;
  LayoutOf<std::uint64_t> layout;

  /// Nothing if it can't be read.
  std::optional<Structure> Fetch(std::uint64_t address, std::uint32_t size) const;

  /// A sum of addresses as the process forms it.
  std::uint64_t Sum(std::uint64_t address, std::uint64_t distance) const {
    return layout.pointerSize == 4 ? (address + distance) & UINT32_MAX : address + distance;
  }
};

/// The libraries of a process, most often one: a program and its plug-ins can have a static one
/// each.
std::vector<Library> FindLibraries(const Memory& memory);

} // namespace VOK::MemPool::Tools

#endif
