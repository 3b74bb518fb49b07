#include "record/Stack.h"

#include "record/Channel.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <dlfcn.h>
#include <link.h>
#include <pthread.h>
#include <sched.h>
#include <sys/mman.h>

namespace VOK::MemPool::Record {

namespace {

// libunwind is loaded by name, not linked: it exports the functions of the C++ runtime's unwinder,
// and must not take their place in the program.
using Backtrace = int (*)(void**, int);
using FlushCache = void (*)(void* space, std::uintptr_t low, std::uintptr_t high);
Backtrace backtrace = nullptr;
FlushCache flushCache = nullptr;
void** addressSpace = nullptr;

/// The functions of the library itself that may stand at the inner end of a stack.
constexpr int ownFrames = 8;

// The stacks seen, by hash: linear probing, no deletion, no lock. A slot of the table is claimed by
// its hash and gets its number once the ring has the stack.
struct Known {
  std::atomic<std::uint64_t> hash;
  std::atomic<std::uint32_t> number;
};
constexpr std::uint32_t tableSize = 1 << 20, maxStacks = tableSize / 2;
std::atomic<Known*> table{nullptr};
std::atomic<std::uint32_t> stacks{0};
std::atomic<std::uint64_t> seed{0};

// Walks by frame pointers that the unwinder has confirmed, by hash. Whether a function keeps a
// frame pointer doesn't change from call to call, so that equal addresses are right again.
constexpr std::size_t confirmedSize = 1 << 14;
std::atomic<std::uint64_t> confirmed[confirmedSize];

std::atomic<unsigned long long> modulesSeen{0}; // loads and unloads that the ring knows

std::uint64_t HashOf(void* const* frames, unsigned count) {
  std::uint64_t hash = seed.load(std::memory_order_relaxed) + count;
  for (unsigned i = 0; i < count; ++i) {
    hash = (hash ^ reinterpret_cast<std::uintptr_t>(frames[i])) * 0x9e3779b97f4a7c15;
    hash ^= hash >> 29;
  }
  return hash | 1; // 0 is a free slot
}

struct StackBounds {
  std::uintptr_t begin = 0, end = 0;
};

/// The thread's stack; empty if it isn't known.
const StackBounds& GetStackBounds() {
  thread_local StackBounds bounds;
  pthread_attr_t attributes;
  if (bounds.end == 0 && pthread_getattr_np(pthread_self(), &attributes) == 0) {
    void* low = nullptr;
    std::size_t size = 0;
    pthread_attr_getstack(&attributes, &low, &size);
    pthread_attr_destroy(&attributes);
    bounds.begin = reinterpret_cast<std::uintptr_t>(low);
    bounds.end = bounds.begin + size;
  }
  return bounds;
}

/// Follows the frame pointers as long as they rise within the thread's stack: not at all from the
/// stack of a coroutine, beyond whose end nothing may be readable.
unsigned WalkFrames(void* const* frame, void** frames, unsigned depth) {
  const StackBounds& bounds = GetStackBounds();
  const auto first = reinterpret_cast<std::uintptr_t>(frame);
  const bool isWithin = bounds.begin <= first && first < bounds.end;
  const std::uintptr_t end = isWithin ? bounds.end - 2 * sizeof(void*) : 0;
  unsigned count = 0;
  for (;;) {
    if (frame[1] == nullptr) break;
    frames[count++] = frame[1];
    const auto here = reinterpret_cast<std::uintptr_t>(frame);
    const auto next = reinterpret_cast<std::uintptr_t>(frame[0]);
    if (count == depth || next <= here || next > end || next % alignof(void*) != 0) break;
    frame = static_cast<void* const*>(frame[0]);
  }
  return count;
}

/// Asks the unwinder; `innermost` tells the library's own frames from the program's.
unsigned Unwind(const void* innermost, void** frames, unsigned depth) {
  void* all[maxDepth + ownFrames];
  const int found = backtrace(all, static_cast<int>(depth) + ownFrames);
  void** const end = all + std::max(found, 0);
  void** const begin = std::find(all, end, innermost);
  const auto count = std::min<unsigned>(depth, static_cast<unsigned>(end - begin));
  std::copy_n(begin, count, frames);
  return count;
}

unsigned Capture(void* const* frame, void** frames) {
  const unsigned depth = Channel::GetDepth();
  const unsigned walked = WalkFrames(frame, frames, depth);
  if (backtrace == nullptr) return walked;
  const std::uint64_t hash = HashOf(frames, walked);
  std::atomic<std::uint64_t>& known = confirmed[hash % confirmedSize];
  if (known.load(std::memory_order_relaxed) == hash) return walked;
  void* unwound[maxDepth];
  const unsigned count = Unwind(frame[1], unwound, depth);
  if (count == walked && std::equal(frames, frames + count, unwound))
    known.store(hash, std::memory_order_relaxed);
  if (count == 0) return walked;
  std::copy_n(unwound, count, frames);
  return count;
}

int PutModule(dl_phdr_info* info, std::size_t, void*) {
  const char* const name = info->dlpi_name;
  Channel::Put({.kind = Kind::Module, .address = info->dlpi_addr, .size = std::strlen(name)}, name,
               std::strlen(name));
  return 0;
}

int CountModules(dl_phdr_info* info, std::size_t, void* count) {
  *static_cast<unsigned long long*>(count) = info->dlpi_adds + info->dlpi_subs;
  return 1;
}

/// Puts all modules if some came or went since the last stack that was new.
void PutModules() {
  unsigned long long now = 0;
  dl_iterate_phdr(CountModules, &now);
  if (modulesSeen.exchange(now) == now) return;
  Channel::Put({.kind = Kind::Unload});
  dl_iterate_phdr(PutModule, nullptr);
}

Known* GetTable() {
  Known* known = table.load(std::memory_order_acquire);
  if (known != nullptr) return known;
  void* const memory = mmap(nullptr, tableSize * sizeof(Known), PROT_READ | PROT_WRITE,
                            MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (memory == MAP_FAILED) return nullptr;
  if (table.compare_exchange_strong(known, static_cast<Known*>(memory)))
    return static_cast<Known*>(memory);
  munmap(memory, tableSize * sizeof(Known));
  return known;
}

} // namespace

void Stack::Prepare() {
  void* const library = dlopen("libunwind.so.8", RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) return;
  backtrace = reinterpret_cast<Backtrace>(dlsym(library, "unw_backtrace"));
#if defined(__x86_64__)
  flushCache = reinterpret_cast<FlushCache>(dlsym(library, "_Ux86_64_flush_cache"));
  addressSpace = static_cast<void**>(dlsym(library, "_ULx86_64_local_addr_space"));
#elif defined(__aarch64__)
  flushCache = reinterpret_cast<FlushCache>(dlsym(library, "_Uaarch64_flush_cache"));
  addressSpace = static_cast<void**>(dlsym(library, "_ULaarch64_local_addr_space"));
#endif
  if (flushCache == nullptr || addressSpace == nullptr) backtrace = nullptr;
}

std::uint32_t Stack::GetNumber(void* const* frame) {
  Known* const all = GetTable();
  if (all == nullptr) return 0;
  void* frames[maxDepth];
  const unsigned count = Capture(frame, frames);
  const std::uint64_t hash = HashOf(frames, count);
  for (std::uint64_t i = hash;; ++i) {
    Known& known = all[(i >> 1) % tableSize];
    std::uint64_t there = known.hash.load(std::memory_order_acquire);
    if (there == 0) {
      if (stacks.load(std::memory_order_relaxed) >= maxStacks) return 0;
      if (known.hash.compare_exchange_strong(there, hash)) {
        PutModules();
        const std::uint32_t number = ++stacks;
        Channel::Put({.kind = Kind::Stack, .stack = number, .size = count}, frames,
                     count * sizeof *frames);
        known.number.store(number, std::memory_order_release);
        return number;
      }
    }
    if (there != hash) continue;
    for (;;) {
      const std::uint32_t number = known.number.load(std::memory_order_acquire);
      if (number != 0) return number;
      sched_yield(); // another thread puts this stack
    }
  }
}

void Stack::Forget() {
  if (flushCache != nullptr) flushCache(*addressSpace, 0, 0);
  for (auto& one : confirmed)
    one.store(0, std::memory_order_relaxed);
  seed.fetch_add(0x9e3779b97f4a7c15, std::memory_order_relaxed);
  modulesSeen = 0;
}

void Stack::Restart() {
  Known* const old = table.exchange(nullptr);
  if (old != nullptr) munmap(old, tableSize * sizeof(Known));
  stacks = 0;
  modulesSeen = 0;
}

} // namespace VOK::MemPool::Record
