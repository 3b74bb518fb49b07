// What the library reports to each memory-checking tool. None is a dependency: memcheck is
// reached by a sequence of instructions that means nothing outside of it, the others by names that
// stay null where no tool defines them. Test: tests/process_test.py.
#include "services/Observers.h"

#include <atomic>

// Named by what they mean here; what the linker looks for is beside it.
#ifdef _WIN32
constexpr void (*VokAsanPoison)(const volatile void*, std::size_t) = nullptr;
constexpr void (*VokAsanUnpoison)(const volatile void*, std::size_t) = nullptr;
constexpr void (*VokHeaptrackMade)(void*, std::size_t) = nullptr;
constexpr void (*VokHeaptrackGone)(void*) = nullptr;
#else
#define VOK_WEAK(name) __asm__(name) __attribute__((weak))
extern "C" {
void VokAsanPoison(const volatile void*, std::size_t) VOK_WEAK("__asan_poison_memory_region");
void VokAsanUnpoison(const volatile void*, std::size_t) VOK_WEAK("__asan_unpoison_memory_region");
void VokHeaptrackMade(void*, std::size_t) VOK_WEAK("heaptrack_malloc");
void VokHeaptrackGone(void*) VOK_WEAK("heaptrack_free");
}
#endif

namespace VOK::MemPool::Observers {

std::uint8_t watching = 0;

namespace {

namespace Memcheck {

enum Request : std::uintptr_t {
  RunningOnValgrind = 0x1001,
  CreatePool = 0x1303,
  DestroyPool = 0x1304,
  PoolAlloc = 0x1305,
  PoolFree = 0x1306,
  ChangeReporting = 0x1801,
  MakeNoAccess = 0x4D430000, // 'M', 'C': of memcheck alone
  MakeDefined = 0x4D430002,
};

/// Bytes before a record and after it that are reported as its own: the next header.
constexpr std::uintptr_t redZone = 4;

bool isThere = false;

/// The answer of the valgrind tool that the process runs in, 0 if it has none or runs in none.
std::uintptr_t Ask(Request request, const void* p, std::uintptr_t second = 0,
                   std::uintptr_t third = 0) {
  std::uintptr_t answer = 0;
  [[maybe_unused]] const volatile std::uintptr_t arguments[] = {
      request, reinterpret_cast<std::uintptr_t>(p), second, third, 0, 0};
#if defined(__x86_64__)
  __asm__ volatile("rolq $3, %%rdi; rolq $13, %%rdi; rolq $61, %%rdi; rolq $51, %%rdi\n\t"
                   "xchgq %%rbx, %%rbx"
                   : "=d"(answer)
                   : "a"(arguments), "0"(answer)
                   : "cc", "memory");
#elif defined(__i386__)
  __asm__ volatile("roll $3, %%edi; roll $13, %%edi; roll $29, %%edi; roll $19, %%edi\n\t"
                   "xchgl %%ebx, %%ebx"
                   : "=d"(answer)
                   : "a"(arguments), "0"(answer)
                   : "cc", "memory");
#endif
  return answer;
}

void Tell(Request request, const void* p, std::uintptr_t second = 0, std::uintptr_t third = 0) {
  if (isThere) Ask(request, p, second, third);
}

/// Only memcheck knows requests of its own letters.
bool Look() {
  char byte = 0;
  return Ask(MakeDefined, &byte, sizeof byte) != 0;
}

} // namespace Memcheck

namespace AddressSanitizer {

bool IsThere() { return VokAsanPoison != nullptr && VokAsanUnpoison != nullptr; }

// It works in granules of 8 bytes: what it can't mark apart stays open, so that a header, which is
// never marked, is never hit.
void Poison(const void* p, std::size_t size) {
  if (IsThere()) VokAsanPoison(p, size);
}

void Unpoison(const void* p, std::size_t size) {
  if (IsThere()) VokAsanUnpoison(p, size);
}

} // namespace AddressSanitizer

namespace Heaptrack {

bool IsThere() { return VokHeaptrackMade != nullptr && VokHeaptrackGone != nullptr; }

void Made(void* p, std::size_t size) {
  if (IsThere()) VokHeaptrackMade(p, size);
}

void Gone(void* p) {
  if (IsThere()) VokHeaptrackGone(p);
}

} // namespace Heaptrack

} // namespace

void Begin() {
  Memcheck::isThere = Memcheck::Look();
  if (Memcheck::isThere || AddressSanitizer::IsThere() || Heaptrack::IsThere())
    watching |= watchingTool;
}

bool ReplaceHeap() { return Present() || Memcheck::Ask(Memcheck::RunningOnValgrind, nullptr) != 0; }

bool IsTracing() {
  return (std::atomic_ref<std::uint8_t>(watching).load(std::memory_order_relaxed) &
          watchingTrace) != 0;
}

// A load and a store: the other bit never changes any more, and the last of two calls counts.
void SetTracing(bool on) {
  const std::atomic_ref<std::uint8_t> byte(watching);
  const int others = byte.load(std::memory_order_relaxed) & ~watchingTrace;
  byte.store(static_cast<std::uint8_t>(others | (on ? watchingTrace : 0)),
             std::memory_order_relaxed);
}

void BlockMade(void* block, std::size_t size) {
  constexpr std::size_t links = 2 * sizeof(void*);
  Memcheck::Tell(Memcheck::CreatePool, block, Memcheck::redZone);
  Memcheck::Tell(Memcheck::MakeNoAccess, block, size);
  Memcheck::Tell(Memcheck::PoolAlloc, block, reinterpret_cast<std::uintptr_t>(block), links);
  Memcheck::Tell(Memcheck::MakeDefined, block, links);
  // It saw the block come from the heap; what counts are the records.
  Heaptrack::Gone(block);
}

void BlockGone(void* block, std::size_t size) {
  Memcheck::Tell(Memcheck::DestroyPool, block);
  Memcheck::Tell(Memcheck::MakeDefined, block, size);
  AddressSanitizer::Unpoison(block, size);
}

void Vacant(const void* p, std::size_t capacity) { AddressSanitizer::Poison(p, capacity); }

void RecordMade(const void* block, void* p, std::size_t size, std::size_t capacity) {
  Memcheck::Tell(Memcheck::PoolAlloc, block, reinterpret_cast<std::uintptr_t>(p), size);
  AddressSanitizer::Unpoison(p, size);
  AddressSanitizer::Poison(static_cast<const char*>(p) + size, capacity - size);
  Heaptrack::Made(p, size);
}

void RecordGone(const void* block, void* p, std::size_t capacity) {
  Memcheck::Tell(Memcheck::PoolFree, block, reinterpret_cast<std::uintptr_t>(p));
  Vacant(p, capacity);
  Heaptrack::Gone(p);
}

void Quiet::SetReporting(bool reports) {
  Memcheck::Tell(Memcheck::ChangeReporting,
                 reinterpret_cast<const void*>(reports ? std::uintptr_t(-1) : std::uintptr_t(1)));
}

} // namespace VOK::MemPool::Observers
