// A recorded program: its heap calls, with the slot of each block computed in advance.
#ifndef VOK_BENCH_TRACE_H
#define VOK_BENCH_TRACE_H

#include "Mapped.h"

#include <cstddef>
#include <cstdint>
#include <fstream>
#include <stdexcept>
#include <string>

namespace Bench {

/// bench/traces/README.md documents the file format.
struct Trace {
  enum Call : std::uint32_t { Alloc = 0, Free = 1, Realloc = 2, Calloc = 3 };

  struct Event {
    Call call;
    std::uint32_t slot;
    std::uint32_t size; ///< of the new block; 0 for a free
  };

  MappedVector<Event> events;
  std::uint32_t slots = 0;   ///< the largest number of live blocks
  std::size_t peak = 0;      ///< the number of events up to the largest payload
  std::uint64_t payload = 0; ///< the bytes of all live blocks then

  explicit Trace(const std::string& path) {
    const MappedVector<char> text = Content(path);
    for (auto at = text.begin(); at != text.end();)
      Append(at, text.end());
  }

private:
  using Place = MappedVector<char>::const_iterator;

  MappedVector<std::uint32_t> freeSlots;
  MappedVector<std::uint32_t> sizes;
  std::uint64_t live = 0;

  static MappedVector<char> Content(const std::string& path) {
    std::ifstream file(path, std::ios::binary | std::ios::ate);
    const std::streamoff length = file.tellg();
    if (!file || length < 0) throw std::runtime_error("cannot read " + path);
    MappedVector<char> text(static_cast<std::size_t>(length));
    file.seekg(0).read(text.data(), length);
    if (!file) throw std::runtime_error("cannot read " + path);
    return text;
  }

  static std::uint64_t Number(Place& at, Place end) {
    std::uint64_t number = 0;
    for (unsigned shift = 0; at != end && shift < 64; shift += 7) {
      const auto byte = static_cast<std::uint8_t>(*at++);
      number |= std::uint64_t{byte & 0x7FU} << shift;
      if (byte < 0x80) return number;
    }
    throw std::runtime_error("a trace ends within a number");
  }

  void Append(Place& at, Place end) {
    const std::uint64_t first = Number(at, end);
    const auto call = static_cast<Call>(first & 3);
    const auto operand = static_cast<std::uint32_t>(first >> 2);
    const bool names = call == Free || call == Realloc;
    if (names && operand >= sizes.size()) throw std::runtime_error("a trace names no slot");
    const std::uint32_t slot = names ? operand : NewSlot();
    std::uint32_t size = 0;
    if (call == Realloc)
      size = static_cast<std::uint32_t>(Number(at, end));
    else if (call != Free)
      size = operand;
    else
      freeSlots.push_back(slot);
    live += size;
    live -= sizes[slot];
    sizes[slot] = size;
    events.push_back({call, slot, size});
    if (live > payload) {
      payload = live;
      peak = events.size();
    }
  }

  std::uint32_t NewSlot() {
    if (freeSlots.empty()) {
      sizes.push_back(0);
      return slots++;
    }
    const std::uint32_t slot = freeSlots.back();
    freeSlots.pop_back();
    return slot;
  }
};

} // namespace Bench

#endif
