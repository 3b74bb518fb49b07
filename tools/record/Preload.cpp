// The library that `vokmempool record` preloads: it stands between the program and its allocator,
// calls the allocator, and puts what was done into the process's ring. It uses C functions alone,
// so that it brings no C++ runtime into a C program. `operator new` isn't replaced: it reaches
// malloc, and the call stack names it.
// Test: tests/tools/record_test.py.
#include "record/Channel.h"
#include "record/Stack.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <malloc.h>
#include <pthread.h>
#include <unistd.h>

#define VOK_INTERPOSE extern "C" __attribute__((visibility("default")))

namespace {

using namespace VOK::MemPool::Record;

struct Allocator {
  void* (*malloc)(std::size_t);
  void* (*calloc)(std::size_t, std::size_t);
  void* (*realloc)(void*, std::size_t);
  void (*free)(void*);
  int (*posix_memalign)(void**, std::size_t, std::size_t);
  void* (*aligned_alloc)(std::size_t, std::size_t);
  void* (*memalign)(std::size_t, std::size_t);
  void* (*valloc)(std::size_t);
  void* (*pvalloc)(std::size_t);
  int (*dlclose)(void*);
};
Allocator next{};

// What dlsym asks for while the functions are being found. It is never freed.
alignas(16) char early[16384];
std::size_t earlyUsed = 0;

bool IsEarly(const void* block) { return block >= early && block < early + sizeof early; }

void* GetEarly(std::size_t size) {
  void* const block = early + earlyUsed;
  earlyUsed += (size + 15) / 16 * 16;
  return earlyUsed <= sizeof early ? block : nullptr;
}

template <class Function>
void Find(Function& function, const char* name) {
  function = reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

/// The allocator's functions; the first call finds them. While that call runs there are none.
bool HasNext() {
  static bool isFinding = false;
  if (next.pvalloc != nullptr) return true;
  if (isFinding) return false;
  isFinding = true;
  Find(next.malloc, "malloc");
  Find(next.calloc, "calloc");
  Find(next.realloc, "realloc");
  Find(next.free, "free");
  Find(next.posix_memalign, "posix_memalign");
  Find(next.aligned_alloc, "aligned_alloc");
  Find(next.memalign, "memalign");
  Find(next.valloc, "valloc");
  Find(next.dlclose, "dlclose");
  Find(next.pvalloc, "pvalloc");
  return true;
}

bool isReady = false; // the process is far enough for events

/// A thread's events: none while one is being put, since the recorder's own requests aren't the
/// program's.
class Section {
public:
  Section() : isOuter(isReady && !isInside) {
    if (!isOuter) return;
    const int saved = errno;
    isInside = true;
    isRecording = Channel::IsOpen();
    errno = saved;
  }
  ~Section() {
    if (isOuter) isInside = false;
  }
  Section(const Section&) = delete;
  Section& operator=(const Section&) = delete;

  explicit operator bool() const { return isRecording; }

private:
  static thread_local bool isInside;
  const bool isOuter;
  bool isRecording = false;
};
thread_local bool Section::isInside = false;

/// The program's errno is the allocator's.
void Put(const Event& event) {
  const int saved = errno;
  Channel::Put(event);
  errno = saved;
}

/// A block that the caller of `frame` got.
void PutBlock(void* const* frame, Kind kind, const void* block, std::size_t size,
              std::size_t alignment = 1) {
  const int saved = errno;
  const std::uint32_t stack = Stack::GetNumber(frame);
  errno = saved;
  Put({.kind = kind,
       .alignmentLog = static_cast<std::uint8_t>(std::bit_width(alignment | 1) - 1),
       .stack = stack,
       .address = reinterpret_cast<std::uintptr_t>(block),
       .size = size});
}

void** FrameOf(void* address) { return static_cast<void**>(address); }

} // namespace

// NOLINTBEGIN(readability-inconsistent-declaration-parameter-name): glibc's names are reserved
#define VOK_FRAME FrameOf(__builtin_frame_address(0))

VOK_INTERPOSE void* malloc(std::size_t size) {
  if (!HasNext()) return GetEarly(size);
  const Section section;
  void* const block = next.malloc(size);
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Malloc, block, size);
  return block;
}

VOK_INTERPOSE void* calloc(std::size_t count, std::size_t size) {
  if (!HasNext()) return GetEarly(count * size); // static memory is zero
  const Section section;
  void* const block = next.calloc(count, size);
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Calloc, block, count * size);
  return block;
}

VOK_INTERPOSE void* realloc(void* block, std::size_t size) {
  if (!HasNext()) return GetEarly(size); // of a null pointer
  if (IsEarly(block)) {
    void* const moved = malloc(size);
    const auto most = static_cast<std::size_t>(early + sizeof early - static_cast<char*>(block));
    if (moved != nullptr) std::memcpy(moved, block, std::min(size, most));
    return moved;
  }
  const Section section;
  if (section && block != nullptr)
    Put({.kind = Kind::ReallocBegin, .address = reinterpret_cast<std::uintptr_t>(block)});
  void* const moved = next.realloc(block, size);
  if (!section) return moved;
  if (moved != nullptr)
    PutBlock(VOK_FRAME, block == nullptr ? Kind::Malloc : Kind::Realloc, moved, size);
  else if (block != nullptr)
    Put({.kind = Kind::ReallocEnd, .size = size});
  return moved;
}

VOK_INTERPOSE void free(void* block) {
  if (block == nullptr || !HasNext() || IsEarly(block)) return;
  const Section section;
  if (section) Put({.kind = Kind::Free, .address = reinterpret_cast<std::uintptr_t>(block)});
  next.free(block);
}

VOK_INTERPOSE int posix_memalign(void** block, std::size_t alignment, std::size_t size) {
  if (!HasNext()) return ENOMEM;
  const Section section;
  const int error = next.posix_memalign(block, alignment, size);
  if (section && error == 0) PutBlock(VOK_FRAME, Kind::Aligned, *block, size, alignment);
  return error;
}

VOK_INTERPOSE void* aligned_alloc(std::size_t alignment, std::size_t size) {
  if (!HasNext()) return nullptr;
  const Section section;
  void* const block = next.aligned_alloc(alignment, size);
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Aligned, block, size, alignment);
  return block;
}

VOK_INTERPOSE void* memalign(std::size_t alignment, std::size_t size) {
  if (!HasNext()) return nullptr;
  const Section section;
  void* const block = next.memalign(alignment, size);
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Aligned, block, size, alignment);
  return block;
}

VOK_INTERPOSE void* valloc(std::size_t size) {
  if (!HasNext()) return nullptr;
  const Section section;
  void* const block = next.valloc(size);
  const auto page = static_cast<std::size_t>(getpagesize());
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Aligned, block, size, page);
  return block;
}

VOK_INTERPOSE void* pvalloc(std::size_t size) {
  if (!HasNext()) return nullptr;
  const Section section;
  void* const block = next.pvalloc(size);
  const auto page = static_cast<std::size_t>(getpagesize());
  if (section && block != nullptr) PutBlock(VOK_FRAME, Kind::Aligned, block, size, page);
  return block;
}

VOK_INTERPOSE int dlclose(void* handle) {
  const int error = HasNext() ? next.dlclose(handle) : 0;
  Stack::Forget();
  return error;
}
// NOLINTEND(readability-inconsistent-declaration-parameter-name)

namespace {

void AfterForkInChild() {
  Channel::Forget();
  Stack::Restart();
}

__attribute__((constructor)) void Begin() {
  HasNext();
  Channel::Prepare();
  if (Channel::GetDepth() == 0) return;
  Stack::Prepare();
  pthread_atfork(nullptr, nullptr, AfterForkInChild);
  Channel::IsOpen(); // so that a program's recording precedes those of its children
  isReady = true;
}

} // namespace
