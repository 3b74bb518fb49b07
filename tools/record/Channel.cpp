#include "record/Channel.h"

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace VOK::MemPool::Record {

namespace {

char folder[256];
unsigned depth = 0;
std::atomic<pid_t> recorder{0}; // 0: nothing is recorded

std::atomic<Ring*> ring{nullptr};
std::atomic<bool> isOpening{false};
std::atomic<std::uint32_t> generation{1}; // of the ring: threads are numbered anew in each
std::atomic<std::uint32_t> threads{0};

/// A number in each ring, from the first event of the thread on.
std::uint64_t GetThread() {
  thread_local std::uint32_t ofGeneration = 0;
  thread_local std::uint16_t number = 0;
  const std::uint32_t now = generation.load(std::memory_order_relaxed);
  if (ofGeneration != now) {
    number = static_cast<std::uint16_t>(threads.fetch_add(1, std::memory_order_relaxed));
    ofGeneration = now;
  }
  return number;
}

/// A coarse clock costs a quarter of a fine one, and its steps of some milliseconds take no room in
/// the recording.
std::uint64_t GetTime() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000 +
         static_cast<std::uint64_t>(now.tv_nsec);
}

/// The file is renamed once its header is valid. Its name holds the time, since exec keeps the
/// process.
Ring* Open() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  char path[sizeof folder + 80];
  char ready[sizeof path + 8];
  std::snprintf(path, sizeof path, "%s/%d.%010lld%09ld", folder, getpid(),
                static_cast<long long>(now.tv_sec), now.tv_nsec);
  std::snprintf(ready, sizeof ready, "%s%s", path, ringSuffix);
  const int file = open(path, O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  if (file < 0) return nullptr;
  void* memory = MAP_FAILED;
  if (posix_fallocate(file, 0, sizeof(Ring)) == 0) // a hole could find no memory later: SIGBUS
    memory = mmap(nullptr, sizeof(Ring), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  close(file);
  if (memory == MAP_FAILED) {
    unlink(path);
    return nullptr;
  }
  auto* const made = static_cast<Ring*>(memory); // a new file's zeros are its first state
  made->header.process = getpid();
  made->header.parent = getppid();
  made->header.startTime = GetTime();
  std::rename(path, ready);
  return made;
}

/// A file of the process about itself as an event.
void PutFile(Kind kind, const char* path) {
  char text[4000];
  const int file = open(path, O_RDONLY | O_CLOEXEC);
  const ssize_t length = file < 0 ? 0 : read(file, text, sizeof text);
  if (file >= 0) close(file);
  const std::size_t bytes = length > 0 ? static_cast<std::size_t>(length) : 0;
  Channel::Put({.kind = kind, .size = bytes}, text, bytes);
}

void PutExecutable() {
  char text[4000];
  const ssize_t length = readlink("/proc/self/exe", text, sizeof text);
  const std::size_t bytes = length > 0 ? static_cast<std::size_t>(length) : 0;
  Channel::Put({.kind = Kind::Executable, .size = bytes}, text, bytes);
}

/// Makes the ring, and puts what the process is. Without a ring nothing is recorded.
bool Begin() {
  Ring* const made = Open();
  if (made == nullptr) {
    recorder = 0;
    return false;
  }
  ring.store(made, std::memory_order_release);
  PutExecutable();
  PutFile(Kind::Command, "/proc/self/cmdline");
  return true;
}

bool IsRecorderAlive() { return kill(recorder, 0) == 0 || errno != ESRCH; }

/// Waits until the recorder has taken what `position` is to replace. False if it never will.
bool AwaitRoom(Ring& to, std::uint64_t position) {
  constexpr int nap = 50'000;       // nanoseconds
  constexpr int napsPerLook = 2000; // for the recorder
  for (int naps = 1; position - to.header.taken.load(std::memory_order_acquire) >= ringSlots;
       ++naps) {
    if (to.header.isAbandoned.load(std::memory_order_relaxed) != 0) return false;
    if (naps % napsPerLook == 0 && !IsRecorderAlive()) {
      to.header.isAbandoned.store(1, std::memory_order_relaxed);
      return false;
    }
    const timespec time{0, nap};
    syscall(SYS_nanosleep, &time, nullptr); // no cancellation point, as no request is one
  }
  return true;
}

} // namespace

void Channel::Prepare() {
  const char* const where = std::getenv(folderVariable);
  const char* const setting = std::getenv(settingVariable);
  if (where == nullptr || setting == nullptr || std::strlen(where) >= sizeof folder) return;
  unsigned wanted = 0;
  int process = 0;
  if (std::sscanf(setting, "%u %d", &wanted, &process) != 2) return;
  recorder = process;
  std::memcpy(folder, where, std::strlen(where) + 1);
  depth = std::min(wanted, maxDepth);
}

unsigned Channel::GetDepth() { return depth; }

bool Channel::IsOpen() {
  while (ring.load(std::memory_order_acquire) == nullptr) {
    if (recorder == 0) return false;
    if (!isOpening.exchange(true)) return Begin();
    sched_yield(); // another thread makes the ring
  }
  return true;
}

void Channel::Put(const Event& event) { Put(event, nullptr, 0); }

void Channel::Put(const Event& event, const void* tail, std::size_t bytes) {
  Ring& to = *ring.load(std::memory_order_relaxed);
  const std::uint64_t thread = GetThread();
  const std::uint64_t slots = 1 + (bytes + bytesPerSlot - 1) / bytesPerSlot;
  std::uint64_t position = to.header.reserved.fetch_add(slots, std::memory_order_relaxed);
  if (!AwaitRoom(to, position + slots - 1)) return;

  const auto publish = [&](Slot& slot) {
    slot.turn.store(static_cast<std::uint32_t>(position / ringSlots + 1),
                    std::memory_order_release);
  };
  Slot& first = to.slots[position % ringSlots];
  first.stack = event.stack;
  first.time = GetTime();
  first.address = (event.address & addressMask) | static_cast<std::uint64_t>(event.kind)
                                                      << kindShift;
  first.size = std::min(event.size, sizeMask) |
               static_cast<std::uint64_t>(event.alignmentLog) << alignmentShift |
               thread << threadShift;
  publish(first);
  for (const char* from = static_cast<const char*>(tail); bytes > 0;) {
    ++position;
    Slot& slot = to.slots[position % ringSlots];
    const std::size_t part = std::min(bytes, bytesPerSlot);
    slot.stack = tailMark;
    std::memcpy(&slot.time, from, part);
    publish(slot);
    from += part;
    bytes -= part;
  }
}

void Channel::Forget() {
  Ring* const old = ring.exchange(nullptr);
  if (old != nullptr) munmap(old, sizeof(Ring));
  isOpening = false;
  threads = 0;
  ++generation;
}

} // namespace VOK::MemPool::Record
