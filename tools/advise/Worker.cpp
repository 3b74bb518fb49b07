// vokmempool-replay: replays operations once, in a process of its own, and prints what that took.
// It is started by `vokmempool advise` and `vokmempool replay`, with the allocator under test
// preloaded. Test: tests/tools/record_test.py.
#include "advise/Operations.h"

#include <MemPoolAllocator>
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <exception>
#include <fcntl.h>
#include <memory>
#include <span>
#include <stdexcept>
#include <string>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

using namespace VOK::MemPool;
using namespace VOK::MemPool::Tools;

[[noreturn]] void Fail(const char* what, int status = 1) {
  std::fprintf(stderr, "%s\n", what); // vokmempool says who failed
  std::exit(status);
}

struct Block {
  void* data = nullptr;
  std::uint32_t size = 0;
};

struct Figures {
  std::uint64_t nanoseconds = 0;
  std::uint64_t bytes = 0;     ///< resident in the heap at the peak
  std::uint64_t bytesHeld = 0; ///< by the pools, at their own peak
};

/// A program writes what it allocates: each line of a small block, each page of a large one.
void Touch(const Block& block) {
  constexpr std::uint32_t line = 64;
  constexpr std::uint32_t page = 4096;
  auto* const bytes = static_cast<volatile char*>(block.data);
  for (std::uint32_t i = 0; i < block.size; i += i < page ? line : page)
    bytes[i] = 1;
}

/// Bytes of memory that belong to no file.
std::uint64_t ResidentBytes() {
  char text[4096];
  const int file = open("/proc/self/status", O_RDONLY | O_CLOEXEC);
  const ssize_t length = read(file, text, sizeof text - 1);
  close(file);
  text[length > 0 ? length : 0] = 0;
  const char* const line = std::strstr(text, "RssAnon:");
  return line != nullptr ? std::strtoull(line + sizeof "RssAnon:", nullptr, 10) * 1024 : 0;
}

std::uint64_t GetTime() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000 +
         static_cast<std::uint64_t>(now.tv_nsec);
}

/// What an object of 8 bytes or of several times that may hold.
struct alignas(8) Word {
  unsigned char bytes[8];
};

/// A pool as a program uses it: with an adaptor where the data may need alignment.
struct Group {
  Group(const std::string& name, const Options& options, bool isAligned_)
      : pool(name, options), words(pool), isAligned(isAligned_) {}

  void* Alloc(std::uint32_t size) {
    return isAligned ? words.allocate(size / sizeof(Word)) : pool.Alloc(size);
  }
  void Free(const Block& block) {
    if (isAligned)
      words.deallocate(static_cast<Word*>(block.data), block.size / sizeof(Word));
    else
      pool.Free(block.data);
  }

  Mgr pool;
  Allocator<Word> words;
  const bool isAligned;
  bool isUsed = false; ///< by an operation
};

/// The operations, without those that a Reset spares the program, so that their reading costs
/// nothing either.
class Operations {
public:
  Operations(const OperationsHeader& whole, std::uint64_t pooled, bool resets) : header(whole) {
    const std::span all(reinterpret_cast<const Operation*>(&whole + 1), whole.count);
    list.reserve(whole.count); // growth would leave memory behind that the replay gets
    for (std::uint64_t i = 0; i < whole.count; ++i) {
      const bool isPooled = (pooled >> all[i].group & 1) != 0;
      if (i == whole.first) header.first = list.size();
      if (i == whole.peak) header.peak = list.size();
      if (all[i].action == Action::Reset
              ? resets && isPooled
              : all[i].action != Action::FreeWithAll || !resets || !isPooled)
        list.push_back(all[i]);
    }
    header.count = list.size();
  }

  OperationsHeader header;
  std::vector<Operation> list;
};

class Replay {
public:
  /// Only the groups in the bits of `pooled` have pools.
  Replay(const Operations& all, const Options& options, std::uint64_t pooled)
      : header(all.header), operations(all.list), blocks(header.slots), groups(header.groups) {
    for (std::uint32_t group = 1; group < header.groups; ++group)
      if ((pooled >> group & 1) != 0)
        groups[group] = std::make_unique<Group>("group " + std::to_string(group), options,
                                                (header.aligned >> group & 1) != 0);
  }

  Figures Run() {
    Figures figures;
    const std::uint64_t before = ResidentBytes();
    RunTo(header.first);
    std::uint64_t start = GetTime();
    RunTo(std::min(header.peak + 1, header.count));
    figures.nanoseconds = GetTime() - start;
    figures.bytes = ResidentBytes() - before;
    start = GetTime();
    RunTo(header.count);
    figures.nanoseconds += GetTime() - start;
    for (const auto& group : groups)
      if (group) figures.bytesHeld += group->pool.GetStats().peakBytesHeld;
    return figures;
  }

  void Report(bool detailed) {
    RunTo(header.count);
    for (const auto& group : groups)
      if (group && group->isUsed) detailed ? group->pool.DbgDetailed() : group->pool.Dbg();
  }

private:
  void RunTo(std::uint64_t end) {
    for (; at < end; ++at)
      Do(operations[at]);
  }

  void Do(const Operation& operation) {
    Group* const group = groups[operation.group].get();
    if (group != nullptr) group->isUsed = true;
    Block& block = blocks[operation.slot];
    switch (operation.action) {
    case Action::Alloc:
    case Action::AllocZero:
      block = {group != nullptr ? group->Alloc(operation.size) : AllocFromHeap(operation),
               operation.size};
      if (block.data == nullptr) Fail("out of memory");
      if (group != nullptr && operation.action == Action::AllocZero)
        std::memset(block.data, 0, block.size);
      return Touch(block);
    case Action::FreeWithAll:
    case Action::Free:
      return Free(group, block);
    case Action::Resize:
      return Resize(group, block, operation.size);
    case Action::Reset:
      if (group != nullptr) group->pool.Reset();
      return;
    }
  }

  static void Free(Group* group, const Block& block) {
    group != nullptr ? group->Free(block) : std::free(block.data);
  }

  static void* AllocFromHeap(const Operation& operation) {
    if (operation.action == Action::AllocZero) return std::calloc(1, operation.size);
    if (operation.alignmentLog == 0) return std::malloc(operation.size);
    void* data = nullptr;
    const std::size_t alignment = std::size_t(1) << operation.alignmentLog;
    return posix_memalign(&data, alignment, operation.size) == 0 ? data : nullptr;
  }

  static void Resize(Group* group, Block& block, std::uint32_t size) {
    const Block old = block;
    if (group == nullptr) {
      block = {std::realloc(old.data, size), size};
      if (block.data == nullptr) Fail("out of memory");
    } else {
      block = {group->Alloc(size), size};
      std::memcpy(block.data, old.data, size < old.size ? size : old.size);
      Free(group, old);
    }
    Touch(block);
  }

  const OperationsHeader& header;
  const std::span<const Operation> operations;
  std::vector<Block> blocks;
  std::vector<std::unique_ptr<Group>> groups;
  std::uint64_t at = 0;
};

const OperationsHeader& Map(const char* path) {
  const int file = open(path, O_RDONLY | O_CLOEXEC);
  struct stat state {};
  if (file < 0 || fstat(file, &state) != 0) Fail("the operations can't be opened");
  void* const memory = mmap(nullptr, static_cast<std::size_t>(state.st_size), PROT_READ,
                            MAP_SHARED | MAP_POPULATE, file, 0);
  if (memory == MAP_FAILED) Fail("the operations can't be mapped");
  return *static_cast<const OperationsHeader*>(memory);
}

} // namespace

/// FILE POOLED BUCKET MIN MAX ALIGNMENT KEEP RESET [Dbg | DbgDetailed]: POOLED has a bit for each
/// group with a pool, a setting of 0 is "as set".
int main(int argc, char** argv) {
  if (argc != 9 && argc != 10) Fail("started with other arguments than vokmempool has");
  const OperationsHeader& header = Map(argv[1]);
  const auto number = [&](int i) {
    return static_cast<unsigned>(std::strtoul(argv[i], nullptr, 10));
  };
  Options options;
  options.On();
  if (number(3) != 0) options.BucketSize(number(3));
  if (number(4) != 0) options.MinRecordSize(number(4));
  if (number(5) != 0) options.MaxRecordSize(number(5));
  if (number(6) != 0) options.DataAlignment(number(6));
  options.KeepEmptyBuckets(number(7) != 0);
  try {
    const std::uint64_t pooled = std::strtoull(argv[2], nullptr, 10);
    const Operations operations(header, pooled, number(8) != 0);
    Replay replay(operations, options, pooled);
    if (argc == 10) {
      replay.Report(std::strcmp(argv[9], "DbgDetailed") == 0);
    } else {
      const Figures figures = replay.Run();
      std::printf("%llu %llu %llu\n", static_cast<unsigned long long>(figures.nanoseconds),
                  static_cast<unsigned long long>(figures.bytes),
                  static_cast<unsigned long long>(figures.bytesHeld));
    }
  } catch (const std::invalid_argument& error) {
    Fail(error.what(), badSettings);
  } catch (const std::exception& error) {
    Fail(error.what());
  }
  std::fflush(stdout);
  std::_Exit(0); // what is left isn't part of the replay
}
