#include "record/Drain.h"

#include "common/Tool.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <fmt/format.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace VOK::MemPool::Tools {

using namespace Record;

namespace {

Ring* Map(const std::string& path) {
  const int file = open(path.c_str(), O_RDWR | O_CLOEXEC);
  void* memory = MAP_FAILED;
  struct stat state {};
  if (file >= 0 && fstat(file, &state) == 0 && state.st_size == sizeof(Ring))
    memory = mmap(nullptr, sizeof(Ring), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  const int error = errno;
  if (file >= 0) close(file);
  unlink(path.c_str());
  if (memory == MAP_FAILED)
    throw Failure(fmt::format("{}: can't be mapped: {}", path, std::strerror(error)));
  return static_cast<Ring*>(memory);
}

constexpr std::uint64_t nanosecondsPerMicrosecond = 1000;

Entry EntryOf(Kind kind) {
  switch (kind) {
  case Kind::Calloc:
    return Entry::Calloc;
  case Kind::Aligned:
    return Entry::Aligned;
  case Kind::Realloc:
    return Entry::Realloc;
  default:
    return Entry::Malloc;
  }
}

} // namespace

void Drain::Unmap::operator()(Ring* mapped) const { munmap(mapped, sizeof(Ring)); }

Drain::Drain(const std::string& path, const std::string& recording, unsigned depth)
    : ring(Map(path)), process(ring->header.process), writer(recording),
      time(ring->header.startTime / nanosecondsPerMicrosecond) {
  writer.Put(Entry::Process, {static_cast<std::uint64_t>(process),
                              static_cast<std::uint64_t>(ring->header.parent), depth});
}

/// The slot of that position, null if it isn't published.
const Slot* Drain::Published(std::uint64_t position) const {
  const Slot& slot = ring->slots[position % ringSlots];
  const auto turn = static_cast<std::uint32_t>(position / ringSlots + 1);
  return slot.turn.load(std::memory_order_acquire) == turn ? &slot : nullptr;
}

std::uint64_t Drain::SlotsOf(const Slot& slot) const {
  const std::uint64_t size = slot.size & sizeMask;
  switch (static_cast<Kind>(slot.address >> kindShift)) {
  case Kind::Stack:
    return 1 + (size * sizeof(void*) + bytesPerSlot - 1) / bytesPerSlot;
  case Kind::Module:
  case Kind::Command:
  case Kind::Executable:
    return 1 + (size + bytesPerSlot - 1) / bytesPerSlot;
  default:
    return 1;
  }
}

bool Drain::Take() {
  const std::uint64_t start = at;
  constexpr std::uint64_t most = ringSlots / 16; // so that a thread that waits goes on soon
  while (at - start < most) {
    const Slot* const first = Published(at);
    if (first == nullptr) break;
    const std::uint64_t slots = SlotsOf(*first);
    bool isWhole = true;
    for (std::uint64_t i = 1; i < slots && isWhole; ++i)
      isWhole = Published(at + i) != nullptr;
    if (!isWhole) break;
    PutSlots(at, *first, slots);
    at += slots;
  }
  ring->header.taken.store(at, std::memory_order_release);
  return at != start;
}

void Drain::End() {
  ring->header.isAbandoned = 1; // of a process that goes on without the recorder
  const std::uint64_t end = std::min(ring->header.reserved.load(), at + ringSlots);
  while (at < end) {
    if (Take()) continue;
    ++numLost;
    for (++at; at < end; ++at)
      if (const Slot* const slot = Published(at); slot != nullptr && slot->stack != tailMark) break;
  }
  writer.Put(Entry::End, {numEvents, numLost});
  writer.Close();
}

std::string Drain::TailOf(std::uint64_t position, std::uint64_t slots, std::uint64_t size) const {
  std::string tail;
  for (std::uint64_t i = 1; i < slots; ++i) {
    const Slot& slot = ring->slots[(position + i) % ringSlots];
    tail.append(reinterpret_cast<const char*>(&slot.time), bytesPerSlot);
  }
  tail.resize(size);
  return tail;
}

void Drain::PutSlots(std::uint64_t position, const Slot& first, std::uint64_t slots) {
  const auto kind = static_cast<Kind>(first.address >> kindShift);
  const std::uint64_t address = first.address & addressMask;
  const std::uint64_t size = first.size & sizeMask;
  if (kind == Kind::Stack)
    return PutStack(first.stack, TailOf(position, slots, slots > 1 ? size * sizeof(void*) : 0));
  if (kind > Kind::Stack)
    return PutInformation(kind, address, TailOf(position, slots, slots > 1 ? size : 0));

  const std::uint64_t now = first.time / nanosecondsPerMicrosecond;
  if (now > time) writer.Put(Entry::Time, {now - std::exchange(time, now)});
  const std::uint64_t maker = first.size >> threadShift;
  if (maker != thread) writer.Put(Entry::Thread, {thread = maker});
  switch (kind) {
  case Kind::ReallocBegin:
    reallocated[maker] = {address, TakeBlock(address)};
    return;
  case Kind::ReallocEnd: {
    const auto [old, block] = std::exchange(reallocated[maker], {});
    if (size != 0)
      live.FindOrAdd(old).block = block; // it is as it was
    else if (block == 0)
      PutEvent(Entry::FreeUnknown, {});
    else
      PutEvent(Entry::Free, {lastBlock - block});
    return;
  }
  case Kind::Free:
    return PutFree(address);
  default:
    return PutBlock(kind, first);
  }
}

void Drain::PutInformation(Kind kind, std::uint64_t address, const std::string& tail) {
  const std::string text = tail.substr(0, mostText);
  switch (kind) {
  case Kind::Module:
    return writer.Put(Entry::Module, {address, text.size()}, text);
  case Kind::Unload:
    return writer.Put(Entry::Unload, {});
  case Kind::Command:
    return writer.Put(Entry::Command, {text.size()}, text);
  default:
    return writer.Put(Entry::Executable, {text.size()}, text);
  }
}

// Threads number their stacks before they put them, so the numbers come in any order. The file has
// them by their order in it.
void Drain::PutStack(std::uint32_t number, const std::string& frames) {
  stackNumbers[number] = ++numStacks;
  const std::size_t count = frames.size() / sizeof(std::uint64_t);
  writer.Put(Entry::Stack, {count});
  std::uint64_t before = 0;
  for (std::size_t i = 0; i < count; ++i) {
    std::uint64_t frame = 0;
    std::memcpy(&frame, frames.data() + i * sizeof frame, sizeof frame);
    const std::uint64_t difference = frame - std::exchange(before, frame);
    const std::uint64_t sign = difference >> 63;
    writer.PutNumber((difference << 1) ^ (0 - sign));
  }
}

void Drain::PutEvent(Entry entry, std::initializer_list<std::uint64_t> numbers) {
  ++numEvents;
  writer.Put(entry, numbers);
}

void Drain::PutBlock(Kind kind, const Slot& slot) {
  const std::uint64_t address = slot.address & addressMask;
  const std::uint64_t size = slot.size & sizeMask;
  const std::uint64_t alignmentLog = slot.size >> alignmentShift & 0x3f;
  const auto known = stackNumbers.find(slot.stack);
  const std::uint64_t stack = known != stackNumbers.end() ? known->second : 0;
  std::uint64_t old = 0;
  if (kind == Kind::Realloc) old = std::exchange(reallocated[slot.size >> threadShift], {}).second;
  if (live.Find(address) != nullptr) { // its release was lost
    PutFree(address);
    ++numLost;
  }
  if (kind == Kind::Realloc && old == 0) kind = Kind::Malloc;
  if (kind == Kind::Realloc)
    PutEvent(EntryOf(kind), {lastBlock - old, size, stack});
  else if (kind == Kind::Aligned)
    PutEvent(EntryOf(kind), {size, stack, alignmentLog});
  else
    PutEvent(EntryOf(kind), {size, stack});
  live.FindOrAdd(address).block = ++lastBlock;
}

void Drain::PutFree(std::uint64_t address) {
  const std::uint64_t block = TakeBlock(address);
  if (block == 0)
    PutEvent(Entry::FreeUnknown, {});
  else
    PutEvent(Entry::Free, {lastBlock - block});
}

/// The number of the block there, which is no longer live; 0 if it is from before the recording.
std::uint64_t Drain::TakeBlock(std::uint64_t address) {
  Live* const found = live.Find(address);
  if (found == nullptr) return 0;
  const std::uint64_t block = found->block;
  live.Remove(*found);
  return block;
}

} // namespace VOK::MemPool::Tools
