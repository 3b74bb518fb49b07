// The test program's general heap, replaced: while a test asks for it, operator new allocates
// from an arena at a fixed place. Equal calls give equal addresses, of eight hexadecimal
// digits at 4-byte pointers and twelve at 8-byte pointers, on every platform and in every run; with
// VOK_MEMPOOL_LOW_ARENA defined they have eight at each width.
#ifndef VOK_MEMPOOL_TESTS_ARENAHEAP_H
#define VOK_MEMPOOL_TESTS_ARENAHEAP_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

using Bytes = std::vector<std::uint8_t>;

/// A fresh arena, for as long as the object lives; one at a time. Blocks are filled with
/// `delivered` and lie between guards. As on many a heap, the last 4 bytes before a block hold
/// its size, low byte first: for 65536 bytes and more they read like a used record's header.
class ArenaHeap {
public:
  enum class Form { Plain, Array };
  struct Event {
    char kind; ///< '+' allocated, '-' freed, '!' failed
    Form form;
    std::size_t size;
    const void* block; ///< null where it failed
    Bytes bytes;       ///< of a block that is freed, as it was
  };

  static constexpr std::uint8_t delivered = 0xDB; ///< fills a new block
  static constexpr std::uint8_t freed = 0xDD;     ///< fills a freed one

  std::vector<Event> events;       ///< all since a test emptied it
  std::vector<std::string> faults; ///< wrong forms, wrong sizes, broken guards, stray pointers

  ArenaHeap();
  ~ArenaHeap();
  ArenaHeap(const ArenaHeap&) = delete;
  ArenaHeap& operator=(const ArenaHeap&) = delete;

  /// While it lives, operator new allocates from the arena (or, given false, from the real heap).
  /// A block of the arena is freed there at any time.
  class Use {
  public:
    explicit Use(bool arena = true) : before(std::exchange(inUse, arena)) {}
    ~Use() { inUse = before; }

  private:
    const bool before;
  };
  static inline thread_local bool inUse = false;

  /// The `k`-th allocation from now throws bad_alloc, with a `k` of 0 none does.
  void FailAt(unsigned k) { failIn = k; }

  /// Adds the live blocks to the faults, and returns all of them.
  const std::vector<std::string>& Finish();

  /// For the memory-checking tools, so that a test may read free records.
  static void Unpoison(const void* from, std::size_t size);

  void* Allocate(std::size_t size, Form form);
  void Free(void* block, Form form, const std::size_t* size);

private:
  void Fault(const std::string& what, std::size_t size) {
    faults.push_back(what + ": a block of " + std::to_string(size) + " bytes");
  }
  void CheckGuards(std::uint8_t* p, std::size_t size);

  std::uint8_t* end; // of what was ever allocated, after the last guard
  std::map<std::uint8_t*, std::pair<Form, std::size_t>> live;
  std::map<std::size_t, std::vector<std::uint8_t*>> spare; // by their room
  unsigned failIn = 0;
};

#endif
