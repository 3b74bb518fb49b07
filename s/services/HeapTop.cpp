// The two requests to glibc's malloc, and the test that it is the program's.
// Test: tests/process_test.py.
#include "services/HeapTop.h"

#include "base/KeepStores.h"
#include "services/Observers.h"

#include <cstdlib>

#ifdef __GLIBC__
extern "C" void* VokGlibcMalloc(std::size_t) __asm__("__libc_malloc") __attribute__((weak));
#endif

namespace VOK::MemPool::HeapTop {

namespace {

/// glibc takes the size of a mapped block that is freed for the size from which it maps blocks, and
/// lets the top grow to twice that. This is near the largest block for which it does.
constexpr std::size_t slackBlock = sizeof(void*) == 8 ? 31u << 20 : 448u << 10;

/// What glibc lets the top grow to by itself, and a block that it neither maps nor finds in a hole
/// as a bucket leaves one.
constexpr std::size_t trimThreshold = 128u << 10;
constexpr std::size_t plugBlock = 96u << 10;

/// A program may bring a malloc of its own.
bool IsGlibcs() {
#ifdef __GLIBC__
  return &std::malloc == &VokGlibcMalloc && !Observers::Present();
#else
  return false;
#endif
}

// The compiler would drop an unused block.
void* Block(std::size_t size) {
  void* const block = std::malloc(size);
  KeepStores(block);
  return block;
}

} // namespace

void KeepSlack() {
  static bool isAsked = false;
  if (isAsked || !IsGlibcs()) return;
  isAsked = true;
  std::free(Block(slackBlock));
}

Plug::Plug(std::size_t bytesReleased)
    : block(bytesReleased > trimThreshold && IsGlibcs() ? Block(plugBlock) : nullptr) {}

Plug::~Plug() { std::free(block); }

} // namespace VOK::MemPool::HeapTop
