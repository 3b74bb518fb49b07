#include "support/ArenaHeap.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

#ifdef _WIN32
#include <windows.h>
#else
#include <sys/mman.h>
#endif

#if __has_include(<sanitizer/asan_interface.h>)
#include <sanitizer/asan_interface.h>
#else
#define ASAN_POISON_MEMORY_REGION(place, size) (static_cast<void>(place), static_cast<void>(size))
#define ASAN_UNPOISON_MEMORY_REGION ASAN_POISON_MEMORY_REGION
#endif
#if __has_include(<valgrind/memcheck.h>)
#include <valgrind/memcheck.h>
#else
#define VALGRIND_MAKE_MEM_NOACCESS(place, size) 0
#define VALGRIND_MAKE_MEM_DEFINED(place, size) 0
#endif

namespace {

#ifdef VOK_MEMPOOL_LOW_ARENA
constexpr std::uintptr_t arenaPlace = 0x20000000;
#else
constexpr std::uintptr_t arenaPlace =
    static_cast<std::uintptr_t>(sizeof(void*) == 8 ? 0x200000000000 : 0x20000000);
#endif
constexpr std::size_t arenaSize = 256u << 20;
constexpr std::size_t guard = 16; // before each block and after the last

ArenaHeap* heap = nullptr;

// As any heap does, the arena reports to the memory-checking tools what may be accessed.
void Poison(const void* from, std::size_t size) {
  ASAN_POISON_MEMORY_REGION(from, size);
  static_cast<void>(VALGRIND_MAKE_MEM_NOACCESS(from, size));
}

// Fresh memory at its place, where nothing else may be.
std::uint8_t* Arena() {
  static void* const place =
#ifdef _WIN32
      VirtualAlloc(reinterpret_cast<void*>(arenaPlace), arenaSize, MEM_RESERVE | MEM_COMMIT,
                   PAGE_READWRITE);
#else
      mmap(reinterpret_cast<void*>(arenaPlace), arenaSize, PROT_READ | PROT_WRITE,
           MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_FIXED_NOREPLACE, -1, 0);
#endif
  if (reinterpret_cast<std::uintptr_t>(place) != arenaPlace) std::abort();
  return static_cast<std::uint8_t*>(place);
}

// So that a block's last granule of 16 and the guard after it are always ours.
std::size_t RoomOf(std::size_t size) { return (std::max<std::size_t>(size, 1) + 15) / 16 * 16; }

// Writes a block with the guards around it if it is new; whether all of that is in place.
bool IsFramed(std::uint8_t* p, const Bytes& block, bool isNew) {
  Bytes frame(guard + RoomOf(block.size()) + guard - 4, 0xFD);
  for (unsigned i = 0; i < 4; ++i)
    frame[guard - 4 + i] = static_cast<std::uint8_t>(block.size() >> 8 * i);
  std::ranges::copy(block, frame.begin() + guard);
  ArenaHeap::Unpoison(p - guard, frame.size());
  if (isNew) std::ranges::copy(frame, p - guard);
  const bool isFramed = std::equal(frame.begin(), frame.end(), p - guard);
  Poison(p - guard, frame.size());
  ArenaHeap::Unpoison(p, block.size());
  return isFramed;
}

void* Allocate(std::size_t size, ArenaHeap::Form form) {
  if (heap != nullptr && ArenaHeap::inUse) return heap->Allocate(size, form);
  if (void* const p = std::malloc(std::max<std::size_t>(size, 1))) return p;
  throw std::bad_alloc();
}

void Free(void* p, ArenaHeap::Form form, const std::size_t* size = nullptr) {
  if (reinterpret_cast<std::uintptr_t>(p) - arenaPlace >= arenaSize)
    std::free(p);
  else if (heap != nullptr)
    heap->Free(p, form, size);
}

} // namespace

void ArenaHeap::Unpoison(const void* from, std::size_t size) {
  ASAN_UNPOISON_MEMORY_REGION(from, size);
  static_cast<void>(VALGRIND_MAKE_MEM_DEFINED(from, size));
}

ArenaHeap::ArenaHeap() : end(Arena() + guard) {
  heap = this;
  Poison(Arena(), arenaSize);
}

ArenaHeap::~ArenaHeap() { heap = nullptr; }

void* ArenaHeap::Allocate(std::size_t size, Form form) {
  const Use real(false);
  const auto left = static_cast<std::size_t>(Arena() + arenaSize - end);
  const bool fails = failIn > 0 && --failIn == 0;
  if (fails || size >= left || RoomOf(size) + guard > left) {
    events.push_back({'!', form, size, nullptr, {}});
    const std::new_handler handler = std::get_new_handler();
    if (handler == nullptr) throw std::bad_alloc();
    const Use again;
    handler();
    return Allocate(size, form);
  }
  std::vector<std::uint8_t*>& sameRoom = spare[RoomOf(size)];
  if (sameRoom.empty()) sameRoom.push_back(std::exchange(end, end + RoomOf(size) + guard));
  std::uint8_t* const p = sameRoom.back();
  sameRoom.pop_back();
  IsFramed(p, Bytes(size, delivered), true);
  live[p] = {form, size};
  events.push_back({'+', form, size, p, {}});
  return p;
}

void ArenaHeap::Free(void* block, Form form, const std::size_t* size) {
  const Use real(false);
  auto* const p = static_cast<std::uint8_t*>(block);
  const auto found = live.find(p);
  if (found == live.end()) return Fault("a stray pointer is freed", 0);
  const auto [madeForm, madeSize] = found->second;
  if (madeForm != form) Fault("freed in the wrong form", madeSize);
  if (size != nullptr && *size != madeSize) Fault("freed in the wrong size", madeSize);
  CheckGuards(p, madeSize);
  events.push_back({'-', form, madeSize, p, {p, p + madeSize}});
  live.erase(found);
  std::memset(p, freed, madeSize);
  Poison(p, madeSize);
  spare[RoomOf(madeSize)].push_back(p);
}

const std::vector<std::string>& ArenaHeap::Finish() {
  for (const auto& [p, made] : live) {
    CheckGuards(p, made.second);
    Fault("not freed", made.second);
  }
  return faults;
}

void ArenaHeap::CheckGuards(std::uint8_t* p, std::size_t size) {
  if (!IsFramed(p, {p, p + size}, false)) Fault("written beyond its bounds", size);
}

// The library uses no other form; of those, the standard library uses one.
void* operator new(std::size_t size, const std::nothrow_t&) noexcept { return std::malloc(size); }
void* operator new(std::size_t size) { return Allocate(size, ArenaHeap::Form::Plain); }
void* operator new[](std::size_t size) { return Allocate(size, ArenaHeap::Form::Array); }
void operator delete(void* p) noexcept { Free(p, ArenaHeap::Form::Plain); }
void operator delete[](void* p) noexcept { Free(p, ArenaHeap::Form::Array); }
void operator delete(void* p, std::size_t n) noexcept { Free(p, ArenaHeap::Form::Plain, &n); }
void operator delete[](void* p, std::size_t n) noexcept { Free(p, ArenaHeap::Form::Array, &n); }
