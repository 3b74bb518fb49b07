// The two requests to glibc's malloc, and the test that it is the program's.
// Test: tests/process_test.py.
#include "services/HeapTop.h"

#include "services/Observers.h"

#include <atomic>
#include <cerrno>
#include <cstdlib>

#ifdef __GLIBC__
#include <dlfcn.h>
#include <gnu/libc-version.h>
#endif

namespace VOK::MemPool::HeapTop {

namespace {

/// glibc takes the size of a mapped block that is freed for the size from which it maps blocks, and
/// lets the top grow to twice that. This is near the largest block for which it does.
constexpr std::size_t slackBlock = sizeof(void*) == 8 ? 31u << 20 : 448u << 10;

/// What glibc lets the top grow to by itself.
constexpr std::uint64_t trimThreshold = 128u << 10;

/// Below the size that glibc maps by default, and above the holes that single buckets leave.
constexpr std::size_t plugBlock = 96u << 10;

std::atomic<bool> isGlibcs = false; ///< the heap is glibc's; settled by the first KeepSlack

// Other allocators export glibc's names for malloc, too. So the question is in which library the
// program's malloc lies.
bool IsGlibcs() {
#ifdef __GLIBC__
  Dl_info heap{};
  Dl_info glibc{};
  return !Observers::ReplaceHeap() &&
         dladdr(reinterpret_cast<const void*>(&std::malloc), &heap) != 0 &&
         dladdr(reinterpret_cast<const void*>(&gnu_get_libc_version), &glibc) != 0 &&
         heap.dli_fbase == glibc.dli_fbase;
#else
  return false;
#endif
}

// The compiler would drop an unused block. A failure is none of the caller's.
void* Block(std::size_t size) {
  const int error = errno;
  void* const block = std::malloc(size);
  __asm__ volatile("" : : "r"(block));
  errno = error;
  return block;
}

} // namespace

void KeepSlack() {
  static std::atomic<bool> isAsked = false;
  if (isAsked.exchange(true)) return;
  isGlibcs = IsGlibcs();
  if (isGlibcs) std::free(Block(slackBlock));
}

Plug::Plug(std::uint64_t bytesReleased)
    : block(isGlibcs && bytesReleased > trimThreshold ? Block(plugBlock) : nullptr) {}

Plug::~Plug() { std::free(block); }

} // namespace VOK::MemPool::HeapTop
