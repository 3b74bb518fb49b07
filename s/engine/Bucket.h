// A bucket: one heap block with a header and equal records, chained by 16-bit offsets that live in
// the records themselves. It knows its records and nothing of lists beyond its own four links.
// Test: tests/bucketmgr_test.cpp, tests/model_test.cpp.
#ifndef VOK_MEMPOOL_BUCKET_H
#define VOK_MEMPOOL_BUCKET_H

#include "base/Attributes.h"
#include "engine/Rec.h"

#include <cstddef>
#include <cstdint>
#include <iosfwd>

namespace VOK::MemPool {

struct Group;
struct SizeFreqMap;

/// Offsets with 4-byte and with 8-byte pointers:
/// ```
///      0   0 +-----------+
///            | parent    |
///      4   8 +-----------+
///            | next1     |  all buckets of the Group
///      8  16 +-----------+
///            | prev1     |
///     12  24 +-----------+
///            | next2     |  those with a free record
///     16  32 +-----------+
///            | prev2     |
///     20  40 +-----------+
///            | recsSize  |
///     22  42 +-----------+
///            | recSize   |
///     24  44 +-----------+
///            | freeHead  |
///     26  46 +-----------+ <-- recsBase: offsets count from here, so that no record has the
///            | freeRecs  |     offset 0, which means none
///     28  48 +-----------+ <-- recsBeg: the record of offset 2
///            | record 0  |
///            +-----------+     the record of offset 2 + recSize
///            | record 1  |
///               ...
///            +-----------+ <-- recsEnd: recsBase + recsSize
/// ```
/// In a bucket in service:
/// - recsSize == 2 + totalRecs * recSize, totalRecs >= 1, and neither size ever changes
/// - the free list holds freeRecs records of type Free and ends with offset 0
/// - every other record has the type Used and its own offset
/// - freeHead == 0 exactly when freeRecs == 0
struct Bucket {
  Group* parent;          ///< the owner, first since the way back from a pointer needs it; null
                          ///< only in a bucket that is being released
  Bucket* next1;          ///< next in the list of all buckets, null at the end
  Bucket* prev1;          ///< previous in that list, null at the head
  Bucket* next2;          ///< next in the list of buckets with a free record
  Bucket* prev2;          ///< previous in that list; both mean nothing off the list
  std::uint16_t recsSize; ///< bytes from recsBase to recsEnd
  std::uint16_t recSize;  ///< stride of the records: header and data
  std::uint16_t freeHead; ///< offset of the record that is served next, 0 for none
  std::uint16_t freeRecs; ///< number of free records; last, since recsBase is its address

  /// A bucket of the most records that fit into `bucketSize` bytes, all free, linked into nothing.
  /// The block comes from `operator new[]`, whose exception passes through.
  /// REQUIRES: `dataSize` + 8 <= `bucketSize` <= 65535.
  static Bucket* Create(Group* parent, std::uint32_t bucketSize, std::uint16_t dataSize);

  /// Scrubs the header, so that a stale pointer into the bucket is not taken for a record, and
  /// returns the block to the heap. Does nothing for null and for a scrubbed bucket.
  /// REQUIRES: the bucket is on no list.
  static void Destroy(Bucket* b) noexcept;

  /// The bucket that holds the used record of data pointer `p`, null for every other pointer of a
  /// pool. Reads the 4 bytes before `p` and, if they look used, the header that they lead to.
  static Bucket* FromData(const void* p);

  /// Where the bucket lies if `rec` is a used record of one: two subtractions from the header.
  static Bucket* OfUsed(const Rec* rec);

  /// Takes the head of the free list and returns its data pointer.
  /// REQUIRES: freeRecs > 0.
  void* PopRec();

  /// Puts the record of data pointer `p` back on the head of the free list.
  /// REQUIRES: `p` is a used record of this bucket.
  void PushRec(void* p);

  /// Makes every record free, in ascending order, so that the first request gets the lowest one.
  /// REQUIRES: recsSize and recSize are set.
  void Carve();

  /// How many records the bucket has; stored nowhere, so it costs a division. A damaged header that
  /// gives no number counts as none.
  std::uint32_t TotalRecs() const {
    return recSize == 0 || recsSize < 2 ? 0 : (recsSize - 2u) / recSize;
  }

  VOK_ALWAYS_INLINE std::uint8_t* RecsBase() { return reinterpret_cast<std::uint8_t*>(&freeRecs); }
  VOK_ALWAYS_INLINE Rec* RecAt(std::uint32_t offset) {
    return reinterpret_cast<Rec*>(RecsBase() + offset);
  }

  const std::uint8_t* RecsBase() const { return reinterpret_cast<const std::uint8_t*>(&freeRecs); }
  const Rec* RecAt(std::uint32_t offset) const {
    return reinterpret_cast<const Rec*>(RecsBase() + offset);
  }
  std::uint16_t OffsetOf(const Rec* rec) const {
    return static_cast<std::uint16_t>(reinterpret_cast<const std::uint8_t*>(rec) - RecsBase());
  }

  /// Adds the used records of this bucket to `sizes`.
  void CollectUsedSizes(SizeFreqMap& sizes) const;

  /// The report of this bucket, under the number `bucketNum`, with its titles at `depth`.
  void Dbg(std::ostream& os, std::uint32_t bucketNum, std::uint32_t depth, bool showRecs,
           bool showFreeList) const;

private:
  void DbgHistogram(std::ostream& os, std::uint32_t depth) const;
  void DbgRecs(std::ostream& os, std::uint32_t depth) const;
  void DbgMap(std::ostream& os) const;
  void DbgFreeList(std::ostream& os, std::uint32_t depth) const;
};

/// The distance from a bucket to the point from which its offsets count.
inline constexpr std::size_t recsBaseOffset = offsetof(Bucket, freeRecs);

static_assert(offsetof(Bucket, parent) == 0);
static_assert(offsetof(Bucket, next1) == 1 * sizeof(void*));
static_assert(offsetof(Bucket, prev1) == 2 * sizeof(void*));
static_assert(offsetof(Bucket, next2) == 3 * sizeof(void*));
static_assert(offsetof(Bucket, prev2) == 4 * sizeof(void*));
static_assert(offsetof(Bucket, recsSize) == 5 * sizeof(void*));
static_assert(offsetof(Bucket, recSize) == 5 * sizeof(void*) + 1 * sizeof(std::uint16_t));
static_assert(offsetof(Bucket, freeHead) == 5 * sizeof(void*) + 2 * sizeof(std::uint16_t));
static_assert(offsetof(Bucket, freeRecs) == 5 * sizeof(void*) + 3 * sizeof(std::uint16_t));
static_assert(sizeof(Bucket) == 5 * sizeof(void*) + 4 * sizeof(std::uint16_t), "packed");

/// Calls `visit` with the offset of each record in address order, that of a piece at the end of a
/// damaged area too. The first record is visited before any look at the end; a header whose sizes
/// lead to no record at all gives none.
template <class Visit>
void ForEachRecord(const Bucket& bucket, Visit visit) {
  if (bucket.recSize == 0 || bucket.recsSize < 2) return;
  std::uint32_t offset = 2;
  do {
    visit(offset);
    offset += bucket.recSize;
  } while (offset < bucket.recsSize);
}

// In numbers, since the compiler may take it for granted that no sum of a pointer is null.
VOK_ALWAYS_INLINE Bucket* Bucket::OfUsed(const Rec* rec) {
  return reinterpret_cast<Bucket*>(reinterpret_cast<std::uintptr_t>(rec) - rec->Offset() -
                                   recsBaseOffset);
}

VOK_ALWAYS_INLINE void* Bucket::PopRec() {
  const std::uint16_t offset = freeHead;
  Rec* const rec = RecAt(offset);
  const std::uint16_t next = rec->Offset();
  rec->SetOffset(offset);
  rec->type = RecType::Used;
  freeHead = next;
  --freeRecs;
  return rec->Data();
}

VOK_ALWAYS_INLINE void Bucket::PushRec(void* p) {
  Rec* const rec = Rec::FromData(p);
  const std::uint16_t offset = rec->Offset();
  rec->SetOffset(freeHead);
  freeHead = offset;
  rec->type = RecType::Free;
  ++freeRecs;
}

} // namespace VOK::MemPool

#endif
