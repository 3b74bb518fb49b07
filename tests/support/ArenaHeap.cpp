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

#ifdef __SANITIZE_ADDRESS__
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
constexpr std::size_t guard = 16; // in front of each block and behind the last
constexpr unsigned char guardByte = 0xFD;

// As any heap does, the arena tells the checkers what may be touched.
void Close(const void* place, std::size_t size) {
  ASAN_POISON_MEMORY_REGION(place, size);
  static_cast<void>(VALGRIND_MAKE_MEM_NOACCESS(place, size));
}

ArenaHeap* heap = nullptr;
thread_local bool inUse = false;

// Fresh memory at that place, or whatever the platform gives if it is taken.
void* Map(void* place, std::size_t size) {
#ifdef _WIN32
  return VirtualAlloc(place, size, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE);
#else
  return mmap(place, size, PROT_READ | PROT_WRITE,
              MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_FIXED_NOREPLACE, -1, 0);
#endif
}

std::byte* MapArena() {
  void* const place = Map(reinterpret_cast<void*>(arenaPlace), arenaSize);
  if (reinterpret_cast<std::uintptr_t>(place) != arenaPlace) {
    std::fputs("ArenaHeap: the arena's place is taken\n", stderr);
    std::abort();
  }
  return static_cast<std::byte*>(place);
}

std::byte* Arena() {
  static std::byte* const arena = MapArena();
  return arena;
}

// So that a block's last granule of 16 and the guard behind it are always ours.
std::size_t RoomOf(std::size_t size) { return (size + 15) / 16 * 16; }

void* Allocate(std::size_t size, ArenaHeap::Form form) {
  if (heap != nullptr && inUse) return heap->Take(size, form);
  if (void* const p = std::malloc(std::max<std::size_t>(size, 1))) return p;
  throw std::bad_alloc();
}

void Release(void* p, ArenaHeap::Form form, const std::size_t* size = nullptr) {
  if (!ArenaHeap::Holds(reinterpret_cast<std::uintptr_t>(p)))
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

void ArenaHeap::FailAt(unsigned k, bool andLater) {
  failIn = k;
  failLater = andLater;
}

bool ArenaHeap::Holds(std::uintptr_t address) { return address - arenaPlace < arenaSize; }

void* ArenaHeap::Take(std::size_t size, Form form) {
  const Use real(false);
  ++numCalls;
  const std::size_t room = RoomOf(std::max<std::size_t>(size, 1));
  const auto left = static_cast<std::size_t>(Arena() + arenaSize - end);
  const bool fails = failIn > 0 && --failIn == 0;
  if (fails && failLater) failIn = 1;
  if (fails || size >= left || room + guard > left) {
    events.push_back({'!', form, size, nullptr});
    const std::new_handler handler = std::get_new_handler();
    if (handler == nullptr) throw std::bad_alloc();
    const Use again;
    handler();
    return Take(size, form);
  }
  std::vector<std::byte*>& sameRoom = spare[room];
  std::byte* p = end;
  if (sameRoom.empty()) {
    end += room + guard;
  } else {
    p = sameRoom.back();
    sameRoom.pop_back();
  }
  Open(p - guard, guard + room + guard);
  std::memset(p - guard, guardByte, guard - 4);
  for (unsigned i = 0; i < 4; ++i)
    p[static_cast<int>(i) - 4] = static_cast<std::byte>(size >> 8 * i);
  std::memset(p, delivered, size);
  std::memset(p + size, guardByte, room - size + guard - 4);
  Close(p - guard, guard + room + guard);
  Open(p, size);
  live[p] = {form, size};
  events.push_back({'+', form, size, p});
  return p;
}

void ArenaHeap::GiveBack(void* p, Form form, const std::size_t* size) {
  const Use real(false);
  const auto found = live.find(p);
  if (found == live.end()) return Fault("no block is released", p, {form, 0});
  const Block block = found->second;
  const Event event{'-', form, block.size, p};
  if (block.form != form) Fault("released in the wrong form", p, block);
  if (size != nullptr && *size != block.size) Fault("released in the wrong size", p, block);
  CheckGuards(p, block);
  events.push_back(event);
  if (watch) watch(event);
  live.erase(found);
  std::memset(p, released, block.size);
  Close(p, block.size);
  spare[RoomOf(std::max<std::size_t>(block.size, 1))].push_back(static_cast<std::byte*>(p));
}

const std::vector<std::string>& ArenaHeap::Finish() {
  for (const auto& [p, block] : live) {
    CheckGuards(p, block);
    Fault("still stands", p, block);
  }
  return faults;
}

void ArenaHeap::Fault(const char* what, const void* p, const Block& block) {
  char text[100];
  std::snprintf(text, sizeof text, "%s: %p, %s form, %zu bytes", what, p,
                block.form == Form::Array ? "array" : "plain", block.size);
  faults.emplace_back(text);
}

void ArenaHeap::CheckGuards(const void* p, const Block& block) {
  const std::size_t room = RoomOf(std::max<std::size_t>(block.size, 1));
  const auto* const front = static_cast<const unsigned char*>(p) - guard;
  const unsigned char* const back = front + guard + block.size;
  Open(front, guard + room + guard);
  bool whole = true;
  for (std::size_t i = 0; i < guard - 4; ++i)
    whole &= front[i] == guardByte;
  for (std::size_t i = 0; i < 4; ++i)
    whole &= front[guard - 4 + i] == static_cast<unsigned char>(block.size >> 8 * i);
  for (const unsigned char* b = back; b < front + guard + room + guard - 4; ++b)
    whole &= *b == guardByte;
  Close(front, guard);
  Close(front + guard, room + guard);
  Open(p, block.size);
  if (!whole) Fault("written beyond its bounds", p, block);
}

// The aligned forms pass through: the library uses none.
void* operator new(std::size_t size) { return Allocate(size, ArenaHeap::Form::Plain); }
void* operator new[](std::size_t size) { return Allocate(size, ArenaHeap::Form::Array); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  try {
    return Allocate(size, ArenaHeap::Form::Plain);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
  try {
    return Allocate(size, ArenaHeap::Form::Array);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}
void operator delete(void* p) noexcept { Release(p, ArenaHeap::Form::Plain); }
void operator delete[](void* p) noexcept { Release(p, ArenaHeap::Form::Array); }
void operator delete(void* p, std::size_t n) noexcept { Release(p, ArenaHeap::Form::Plain, &n); }
void operator delete[](void* p, std::size_t n) noexcept { Release(p, ArenaHeap::Form::Array, &n); }
void operator delete(void* p, const std::nothrow_t&) noexcept {
  Release(p, ArenaHeap::Form::Plain);
}
void operator delete[](void* p, const std::nothrow_t&) noexcept {
  Release(p, ArenaHeap::Form::Array);
}
