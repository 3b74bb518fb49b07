// A heap block of its own for a request too large for any bucket, on a list of its pool. Its header
// ends in the shape of a record's, so that a bare data pointer distinguishes the two.
// Test: tests/bucketmgr_test.cpp.
#ifndef VOK_MEMPOOL_EXTREC_H
#define VOK_MEMPOOL_EXTREC_H

#include "engine/Rec.h"

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool {

/// Offsets with 4-byte and with 8-byte pointers:
/// ```
///      0   0 +--------------------------+
///            | next                     |
///      4   8 +--------------------------+
///            | prev                     |
///      8  16 +--------------------------+
///            | length                   |  8 bytes before the data at either width
///     12  20 +------+------+------+-----+
///            | 0xAA | 0xBB | type | 0xCC|  a record's header with type Ext
///     16  24 +------+------+------+-----+
///            | data ...
/// ```
struct ExtRec {
  ExtRec* next;         ///< next of the pool's list, null at the end
  ExtRec* prev;         ///< previous of the list, null at the head
  std::uint32_t length; ///< the size as asked for
  std::uint8_t tag0;    ///< 0xAA: with tag1, what an offset would be in a record
  std::uint8_t tag1;    ///< 0xBB
  RecType type;         ///< Ext, where a record has its type
  std::uint8_t tag3;    ///< 0xCC

  /// A block for `size` bytes of data, linked into nothing. It comes from `operator new[]`, whose
  /// exception passes through.
  static ExtRec* Create(std::uint32_t size);

  /// Gives the block back as it is.
  static void Destroy(ExtRec* e) noexcept;

  /// The ExtRec whose data pointer `p` is, null for every other pointer of a pool and for an
  /// ExtRec of length 0. Reads up to 8 bytes before `p`.
  static ExtRec* FromData(const void* p);

  /// Whether this record can be on the list of `head`: false shows that it belongs to another
  /// pool; true proves no more than that its neighbours agree. Constant time.
  bool FitsList(const ExtRec* head) const;

  /// Puts this record at the head of the list.
  void Link(ExtRec*& head, std::uint32_t& count);

  /// Takes this record out of the list.
  /// REQUIRES: it is on the list of `head`.
  void Unlink(ExtRec*& head, std::uint32_t& count);

  /// Zeroes the header, so that a stale pointer is not taken for an ExtRec.
  void Scrub();

  void* Data() { return this + 1; }
  const void* Data() const { return this + 1; }
};

static_assert(offsetof(ExtRec, next) == 0);
static_assert(offsetof(ExtRec, prev) == sizeof(void*));
static_assert(offsetof(ExtRec, length) == 2 * sizeof(void*));
static_assert(offsetof(ExtRec, tag0) == 2 * sizeof(void*) + 4);
static_assert(offsetof(ExtRec, tag1) == 2 * sizeof(void*) + 5);
static_assert(offsetof(ExtRec, type) == 2 * sizeof(void*) + 6);
static_assert(offsetof(ExtRec, tag3) == 2 * sizeof(void*) + 7);
static_assert(sizeof(ExtRec) == 2 * sizeof(void*) + 8, "packed");
static_assert(sizeof(ExtRec) - offsetof(ExtRec, type) == sizeof(Rec) - offsetof(Rec, type));

} // namespace VOK::MemPool

#endif
