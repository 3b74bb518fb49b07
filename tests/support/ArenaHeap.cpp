#include "support/ArenaHeap.h"

#include <algorithm>
#include <cstdio>
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
#define ASAN_UNPOISON_MEMORY_REGION(place, size) (static_cast<void>(place), static_cast<void>(size))
#endif
#if __has_include(<valgrind/memcheck.h>)
#include <valgrind/memcheck.h>
#else
#define VALGRIND_MAKE_MEM_NOACCESS(place, size) 0
#define VALGRIND_MAKE_MEM_DEFINED(place, size) 0
#endif

namespace {

constexpr std::uintptr_t arenaPlace =
    static_cast<std::uintptr_t>(sizeof(void*) == 8 ? 0x200000000000 : 0x20000000);
constexpr std::size_t arenaSize = 256u << 20;
constexpr std::size_t guard = 16; // before each block and after the last
constexpr std::byte guardByte{0xFD};

// As any heap does, the arena tells the memory-checking tools what may be touched.
void Close(const void* place, std::size_t size) {
  ASAN_POISON_MEMORY_REGION(place, size);
  static_cast<void>(VALGRIND_MAKE_MEM_NOACCESS(place, size));
}

ArenaHeap* heap = nullptr;
thread_local bool inUse = false;

// Fresh memory at that place, or whatever the platform gives if it is in use.
void* Map(void* place, std::size_t size) {
#ifdef _WIN32
  return VirtualAlloc(place, size, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE);
#else
  return mmap(place, size, PROT_READ | PROT_WRITE,
              MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_FIXED_NOREPLACE, -1, 0);
#endif
}

std::byte* Arena() {
  static void* const place = Map(reinterpret_cast<void*>(arenaPlace), arenaSize);
  if (reinterpret_cast<std::uintptr_t>(place) != arenaPlace) {
    std::fputs("ArenaHeap: the arena's place is in use\n", stderr);
    std::abort();
  }
  return static_cast<std::byte*>(place);
}

// So that a block's last granule of 16 and the guard after it are always ours.
std::size_t RoomOf(std::size_t size) { return (std::max<std::size_t>(size, 1) + 15) / 16 * 16; }

// Calls `visit` with each byte of the guards of a block and with what it must hold.
template <class Visit>
void ForGuards(std::byte* p, std::size_t size, const Visit& visit) {
  for (unsigned i = 0; i < guard; ++i)
    visit(*(p - guard + i), i < guard - 4 ? guardByte : std::byte(size >> 8 * (i + 4 - guard)));
  for (std::byte* b = p + size; b < p + RoomOf(size) + guard - 4; ++b)
    visit(*b, guardByte);
}

void* Allocate(std::size_t size, ArenaHeap::Form form) {
  if (heap != nullptr && inUse) return heap->Take(size, form);
  if (void* const p = std::malloc(std::max<std::size_t>(size, 1))) return p;
  throw std::bad_alloc();
}

void Release(void* p, ArenaHeap::Form form, const std::size_t* size = nullptr) {
  if (reinterpret_cast<std::uintptr_t>(p) - arenaPlace >= arenaSize)
    std::free(p);
  else if (heap != nullptr)
    heap->GiveBack(p, form, size);
}

} // namespace

void ArenaHeap::Open(const void* from, std::size_t size) {
  ASAN_UNPOISON_MEMORY_REGION(from, size);
  static_cast<void>(VALGRIND_MAKE_MEM_DEFINED(from, size));
}

ArenaHeap::ArenaHeap() : end(Arena() + guard) {
  heap = this;
  Close(Arena(), arenaSize);
}

ArenaHeap::~ArenaHeap() { heap = nullptr; }

ArenaHeap::Use::Use(bool arena) : before(inUse) { inUse = arena; }
ArenaHeap::Use::~Use() { inUse = before; }

void* ArenaHeap::Take(std::size_t size, Form form) {
  const Use real(false);
  const auto left = static_cast<std::size_t>(Arena() + arenaSize - end);
  const bool fails = failIn > 0 && --failIn == 0;
  if (fails || size >= left || RoomOf(size) + guard > left) {
    events.push_back({'!', form, size, nullptr, {}});
    const std::new_handler handler = std::get_new_handler();
    if (handler == nullptr) throw std::bad_alloc();
    const Use again;
    handler();
    return Take(size, form);
  }
  std::vector<std::byte*>& sameRoom = spare[RoomOf(size)];
  std::byte* p = end;
  if (sameRoom.empty()) {
    end += RoomOf(size) + guard;
  } else {
    p = sameRoom.back();
    sameRoom.pop_back();
  }
  Open(p - guard, guard + RoomOf(size) + guard);
  ForGuards(p, size, [](std::byte& guarded, std::byte wanted) { guarded = wanted; });
  std::memset(p, delivered, size);
  Close(p - guard, guard + RoomOf(size) + guard);
  Open(p, size);
  live[p] = {form, size};
  events.push_back({'+', form, size, p, {}});
  return p;
}

void ArenaHeap::GiveBack(void* block, Form form, const std::size_t* size) {
  const Use real(false);
  auto* const p = static_cast<std::byte*>(block);
  const auto found = live.find(p);
  if (found == live.end()) return Fault("no block is released", 0);
  const Block known = found->second;
  if (known.form != form) Fault("released in the wrong form", known.size);
  if (size != nullptr && *size != known.size) Fault("released in the wrong size", known.size);
  CheckGuards(p, known);
  const auto* const bytes = static_cast<const std::uint8_t*>(block);
  events.push_back({'-', form, known.size, p, {bytes, bytes + known.size}});
  live.erase(found);
  std::memset(p, released, known.size);
  Close(p, known.size);
  spare[RoomOf(known.size)].push_back(p);
}

const std::vector<std::string>& ArenaHeap::Finish() {
  for (const auto& [p, block] : live) {
    CheckGuards(p, block);
    Fault("not released", block.size);
  }
  return faults;
}

void ArenaHeap::CheckGuards(std::byte* p, const Block& block) {
  const std::size_t whole = guard + RoomOf(block.size) + guard;
  bool isWhole = true;
  Open(p - guard, whole);
  ForGuards(p, block.size, [&](std::byte found, std::byte wanted) { isWhole &= found == wanted; });
  Close(p - guard, whole);
  Open(p, block.size);
  if (!isWhole) Fault("written beyond its bounds", block.size);
}

// The library uses no other form; of those, the standard library uses one.
void* operator new(std::size_t size, const std::nothrow_t&) noexcept { return std::malloc(size); }
void* operator new(std::size_t size) { return Allocate(size, ArenaHeap::Form::Plain); }
void* operator new[](std::size_t size) { return Allocate(size, ArenaHeap::Form::Array); }
void operator delete(void* p) noexcept { Release(p, ArenaHeap::Form::Plain); }
void operator delete[](void* p) noexcept { Release(p, ArenaHeap::Form::Array); }
void operator delete(void* p, std::size_t n) noexcept { Release(p, ArenaHeap::Form::Plain, &n); }
void operator delete[](void* p, std::size_t n) noexcept { Release(p, ArenaHeap::Form::Array, &n); }
