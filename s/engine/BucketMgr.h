// One pool: its snapshot of the settings, its table of size classes, its list of ExtRecs. The
// fast paths of Alloc and Free are in FastPath.h, which includes all that they use.
// Test: tests/bucketmgr_test.cpp.
#ifndef VOK_MEMPOOL_BUCKETMGR_H
#define VOK_MEMPOOL_BUCKETMGR_H

#include "engine/SizeClasses.h"

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <string>

namespace VOK::MemPool {

struct Bucket;
struct ExtRec;
struct Group;
struct SizeFreqMap;
class Mgr;
struct Options;

/// Sizes named `...RecSize` are whole records: the data and the 4 bytes of the header.
///
/// In a pool that serves:
/// - minRecSize <= maxRecSize, both multiples of dataAlignment, maxRecSize + 4 <= bucketSize
/// - numGroups == (maxRecSize - minRecSize) / dataAlignment + 1
/// - groups[i], where it is set, is owned by this pool and has RecSizeIndex(dataSize) == i
/// - numExtRecs is the length of the list at extRecs
/// - with `enabled` false every entry and extRecs are null
///
/// It opens with what names the pool, and closes with what the fast path reads beside the table:
/// the two switches, and the fast index, which needs exactly the bytes they leave.
struct BucketMgr {
  std::string name;        ///< the pool's name, also its key in the registry
  Mgr* mgr;                ///< the public handle, which the engine passes to the program at a limit
  Group** groups;          ///< one entry a size class, null until its first request
  ExtRec* extRecs;         ///< head of the list of ExtRecs, null when there is none
  std::uint32_t numGroups; ///< length of `groups`
  std::uint32_t numExtRecs;    ///< length of the list of ExtRecs
  std::uint32_t bucketSize;    ///< the most bytes of a bucket's record area
  std::uint32_t dataAlignment; ///< the multiple to which sizes are rounded, never 0
  std::uint32_t maxRecSize;    ///< largest record that a bucket serves
  std::uint32_t minRecSize;    ///< record size at index 0, to which smaller ones are clamped up
  bool keepEmptyBuckets;       ///< an emptied bucket stays
  bool enabled;                ///< the pool pools; false: every request goes to the heap
  FastIndex fastIndex;         ///< from a size to its index: derived from the sizes, or noFastIndex

  /// Takes the snapshot of the settings, with the options over them, and makes the table. Ends the
  /// process if they make a pool impossible; throws what `operator new[]` throws.
  BucketMgr(Mgr* mgr, const std::string& name, const Options& options);

  /// Releases everything, used or not.
  ~BucketMgr();

  BucketMgr(const BucketMgr&) = delete;
  BucketMgr& operator=(const BucketMgr&) = delete;

  /// A block of at least `size` bytes, never null; the heap's exception passes through.
  /// REQUIRES: `size` <= maxRequest.
  void* Alloc(std::uint32_t size);

  /// Takes back `p`; false, with nothing changed, if it isn't recognised as this pool's.
  bool Free(void* p);

  /// Alloc and Free of an enabled pool by the general mapping, past the checks of a checked pool.
  void* AllocPooled(std::uint32_t size);
  bool FreePooled(void* p);

  /// Releases all records and size classes; the table, the name and the snapshot stay.
  void Clear() noexcept;

  /// Releases all ExtRecs and makes all records free; the buckets and size classes stay. False,
  /// with nothing changed, if `enabled` is false.
  bool Reset() noexcept;

  /// The capacity of a record, the requested size of an ExtRec, 0 for anything else.
  std::uint32_t GetSize(const void* p) const;

  /// Whether `p` is a used record of this pool, or an ExtRec of any.
  bool Contains(const void* p) const;

  /// The bucket of `p` if it is this pool's, else null. With `enabled` false it is null, and no
  /// byte before `p` is read: those bytes are the heap's.
  Bucket* FindBucket(const void* p) const;

  /// The ExtRec of `p` if it can be on this pool's list, else null.
  ExtRec* FindExtRec(void* p) const;

  /// The Group that serves `size` bytes by the fast index; null if there is none, or if the fast
  /// index doesn't reach it.
  Group* FastGroup(std::uint32_t size) const;

  /// The Group that serves `size` bytes, null if there is none. Costs two divisions.
  Group* FindGroup(std::uint32_t size) const;

  /// The Group that serves `dataSize` bytes; the first request makes it, and the heap's exception
  /// passes through.
  /// REQUIRES: `dataSize` is a multiple of dataAlignment, and its record is within maxRecSize.
  Group* GroupFor(std::uint32_t dataSize);

  /// The number of buckets in all size classes.
  std::uint32_t GetNumBuckets() const;

  /// The report of this pool with its first line at `depth`. `detailed` adds a report of each
  /// bucket, in which `showRecs` and `showFreeList` choose the sections.
  void Dbg(std::ostream& os, std::uint32_t depth, bool detailed, bool showRecs,
           bool showFreeList) const;

private:
  void* AllocSlow(std::uint32_t size);
  void* AllocExtRec(std::uint32_t size);
  bool FreeSlow(void* p);
  bool FreeLowAddress(void* p);
  void ReleaseExtRecs() noexcept;

  void* AllocInstrumented(std::uint32_t size);
  void* AllocReported(std::uint32_t size);
  bool FreeInstrumented(void* p);
  bool FreeReported(void* p);
  void ReportAllFree() const;
  void ReportAllGone() const;

  void DbgHistogram(std::ostream& os, std::uint32_t depth, const SizeFreqMap& sizes) const;
  void DbgBuckets(std::ostream& os, std::uint32_t depth) const;
  void DbgFreeBuckets(std::ostream& os, std::uint32_t depth, std::uint32_t freeBucks,
                      std::uint32_t freeBucksM) const;
  void DbgExtRecs(std::ostream& os, std::uint32_t depth) const;
};

// The leading string's size is the standard library's; after it nothing is padded between fields.
static_assert(offsetof(BucketMgr, mgr) == sizeof(std::string));
static_assert(offsetof(BucketMgr, groups) - offsetof(BucketMgr, mgr) == 1 * sizeof(void*));
static_assert(offsetof(BucketMgr, extRecs) - offsetof(BucketMgr, mgr) == 2 * sizeof(void*));
static_assert(offsetof(BucketMgr, numGroups) - offsetof(BucketMgr, mgr) == 3 * sizeof(void*));
static_assert(offsetof(BucketMgr, keepEmptyBuckets) - offsetof(BucketMgr, numGroups) == 6 * 4);
static_assert(offsetof(BucketMgr, enabled) - offsetof(BucketMgr, numGroups) == 6 * 4 + 1);
static_assert(offsetof(BucketMgr, fastIndex) - offsetof(BucketMgr, numGroups) == 6 * 4 + 2);
static_assert(sizeof(void*) != 4 || sizeof(std::string) != 24 || sizeof(BucketMgr) == 64);
static_assert(sizeof(void*) != 8 || sizeof(std::string) != 32 || sizeof(BucketMgr) == 88);

} // namespace VOK::MemPool

#endif
