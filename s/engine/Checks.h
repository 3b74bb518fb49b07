// The checks of a pool built with Options::checked: what it knows of its records beside their own
// headers, and what it finds. It exists for such a pool alone, in the block of the pool, and no
// request of another pool reaches it. Test: tests/checked_test.cpp.
#ifndef VOK_MEMPOOL_CHECKS_H
#define VOK_MEMPOOL_CHECKS_H

#include "MemPool"

#include <cstddef>
#include <cstdint>
#include <map>

namespace VOK::MemPool {

struct Bucket;
struct BucketMgr;
struct Group;

/// Serves the requests of its pool from the pool, each with a guard after the size asked for, and
/// holds freed records back. What it knows of records and buckets is in maps of its own, so that it
/// follows no pointer and no header before it has proved sound; from the maps it mends what isn't.
///
/// A new-handler and Options::atLimit may come back to the pool during Alloc: the nodes of the maps
/// are made before the pool serves, and none is needed after it.
class Checks {
public:
  Checks(BucketMgr& pool, bool endsAtFinding, const Options& options);

  /// Reports what is wrong or in use at the pool's end; releases nothing of the pool.
  ~Checks();

  Checks(const Checks&) = delete;
  Checks& operator=(const Checks&) = delete;

  /// The operations of the pool. Alloc throws what the heap throws, with nothing changed but the
  /// queue of the records held back, which may be empty then.
  void* Alloc(std::uint32_t size);
  bool Free(void* p) noexcept;
  void Clear() noexcept;
  bool Reset() noexcept;

  /// Whether `p` is a record in use; its size as asked for, 0 for anything else.
  bool Contains(const void* p) const;
  std::uint32_t GetSize(const void* p) const;

  unsigned GetNumFindings() const { return numFindings; }

private:
  static constexpr std::uint32_t guardSize = 4; ///< at least; the guard goes up to the record's end

  /// Held records are freed ones that the pool doesn't know of yet. Retired records are damaged and
  /// serve no more until Clear or Reset.
  enum class State : std::uint8_t { Free, Used, Held, Retired };

  /// Of a bucket.
  struct Home {
    Group* group;
    std::uint32_t busy; ///< records whose state isn't Free
  };
  using Homes = std::map<Bucket*, Home>;

  /// A record that was served since its bucket was made, or an ExtRec.
  struct Record {
    Homes::value_type* home; ///< null for an ExtRec
    std::uint32_t size;      ///< as asked for
    State state;
    std::uint64_t number;                     ///< of the request
    std::pair<void* const, Record>* heldNext; ///< held back after this one
  };
  using Records = std::map<void*, Record>;

  void* AllocPooled(std::uint32_t size);
  void Adopt(Homes::value_type& home);
  void TestFreeList(std::uint32_t size);
  void HoldBack(Records::value_type& entry);
  void ReleaseOldest();
  void Forget(Bucket* bucket);

  static std::uint32_t CapacityOf(const Record& record);
  bool IsFree(void* p) const;
  bool IsSound(const Homes::value_type& home) const;
  bool FreeListIsSound(const Homes::value_type& home) const;
  bool HeaderIsSound(const Records::value_type& entry) const;
  bool DataIsSound(const Records::value_type& entry) const;
  bool Passes(Records::value_type& entry);
  void TestAll();

  void Mend(const Homes::value_type& home);
  void Mend(const Records::value_type& entry);

  void Report(Finding::Kind kind, const void* address, const Record* record, bool writes = true);

  BucketMgr& pool;
  Homes homes;
  Records records;
  Homes::node_type spareHome;
  Records::node_type spareRecord;
  Records::value_type* oldestHeld = nullptr;
  Records::value_type* newestHeld = nullptr;
  std::size_t numHeld = 0;
  std::uint64_t numRequests = 0;
  unsigned numFindings = 0;
  const std::size_t heldBack;
  const bool endsAtFinding;
  const decltype(Options::atFinding) atFinding;
  void* const context;
};

} // namespace VOK::MemPool

#endif
