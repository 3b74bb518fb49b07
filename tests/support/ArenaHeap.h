// The test program's general heap, replaced: while a test asks for it, operator new takes its
// blocks from an arena at a fixed place. Equal calls give equal addresses, of eight hexadecimal
// digits at 4-byte pointers and twelve at 8-byte pointers, on every platform and in every run.
#ifndef VOK_MEMPOOL_TESTS_ARENAHEAP_H
#define VOK_MEMPOOL_TESTS_ARENAHEAP_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

/// A fresh arena, for as long as the object lives; one at a time. Blocks are filled with
/// `delivered` and lie between guards. As on many a heap, the last 4 bytes before a block hold
/// its size, low byte first: for 65536 bytes and more they read like a used record's header.
class ArenaHeap {
public:
  enum class Form { Plain, Array };
  struct Event {
    char kind; ///< '+' allocated, '-' released, '!' failed
    Form form;
    std::size_t size;
    const void* block;               ///< null where it failed
    std::vector<std::uint8_t> bytes; ///< of a block that is released, as it was
  };

  static constexpr unsigned char delivered = 0xDB; ///< fills a new block
  static constexpr unsigned char released = 0xDD;  ///< fills a released one

  std::vector<Event> events;       ///< all since a test emptied it
  std::vector<std::string> faults; ///< wrong forms, wrong sizes, broken guards, strays

  ArenaHeap();
  ~ArenaHeap();
  ArenaHeap(const ArenaHeap&) = delete;
  ArenaHeap& operator=(const ArenaHeap&) = delete;

  /// While it lives, operator new takes from the arena (or, given false, from the real heap).
  /// What came from the arena goes back to it at any time.
  class Use {
  public:
    explicit Use(bool arena = true);
    ~Use();

  private:
    const bool before;
  };

  /// The `k`-th allocation from now throws bad_alloc, with a `k` of 0 none does.
  void FailAt(unsigned k) { failIn = k; }

  /// Adds the live blocks to the faults, and returns all of them.
  const std::vector<std::string>& Finish();

  /// Unpoisons these bytes for the memory-checking tools, so that a test may read free records.
  static void Open(const void* from, std::size_t size);

  void* Take(std::size_t size, Form form);
  void GiveBack(void* block, Form form, const std::size_t* size);

private:
  struct Block {
    Form form;
    std::size_t size;
  };

  void Fault(const std::string& what, std::size_t size) {
    faults.push_back(what + ": a block of " + std::to_string(size) + " bytes");
  }
  void CheckGuards(std::byte* p, const Block& block);

  std::byte* end; // of what was ever taken, behind the last guard
  std::map<std::byte*, Block> live;
  std::map<std::size_t, std::vector<std::byte*>> spare; // by their room
  unsigned failIn = 0;
};

#endif
