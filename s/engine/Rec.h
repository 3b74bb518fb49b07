// A record's header: 4 bytes before the data that the caller holds. In a free record they
// chain the free list, in a used one they lead back to the bucket. A record has no alignment
// beyond what its size gives it, so the header is declared in bytes, low byte first everywhere.
// Test: tests/bucketmgr_test.cpp, tests/model_test.cpp.
#ifndef VOK_MEMPOOL_REC_H
#define VOK_MEMPOOL_REC_H

#include "base/Attributes.h"
#include "engine/SizeClasses.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace VOK::MemPool {

/// What byte 2 of a header says; a damaged header holds any other value. `Ext` is the type of an
/// ExtRec, whose header ends in the same shape.
enum class RecType : std::uint8_t { Free = 0, Used = 1, Ext = 2 };

/// ```
///     0          1           2      3         4
///     +----------+-----------+------+---------+------------
///     | offset, low and high | type | as it   | data ...
///     | byte                 |      | was     |
///     +----------+-----------+------+---------+------------
/// ```
struct Rec {
  std::uint8_t offsetLow;  ///< low byte of the next free record's offset, or of this one's own
  std::uint8_t offsetHigh; ///< high byte of the same
  RecType type;            ///< says which of the two offsets the header holds
  std::uint8_t unused;     ///< stays as the heap delivered it

  static VOK_ALWAYS_INLINE Rec* FromData(void* p) {
    return reinterpret_cast<Rec*>(static_cast<std::uint8_t*>(p) - sizeof(Rec));
  }
  static VOK_ALWAYS_INLINE const Rec* FromData(const void* p) {
    return reinterpret_cast<const Rec*>(static_cast<const std::uint8_t*>(p) - sizeof(Rec));
  }

  VOK_ALWAYS_INLINE void* Data() { return this + 1; }

  /// The one pair that accesses the 16-bit number. Each compiles to one access of two bytes on a
  /// little-endian machine; the writer only in this form, since g++ keeps two stores apart in
  /// Bucket::PushRec.
  VOK_ALWAYS_INLINE std::uint16_t Offset() const {
    return static_cast<std::uint16_t>(offsetLow | offsetHigh << 8);
  }
  VOK_ALWAYS_INLINE void SetOffset(std::uint16_t offset) {
    const std::uint8_t bytes[] = {static_cast<std::uint8_t>(offset),
                                  static_cast<std::uint8_t>(offset >> 8)};
    std::memcpy(this, bytes, sizeof bytes);
  }
};

static_assert(offsetof(Rec, offsetLow) == 0 && offsetof(Rec, offsetHigh) == 1);
static_assert(offsetof(Rec, type) == 2 && offsetof(Rec, unused) == 3);
static_assert(sizeof(Rec) == recHeaderSize && alignof(Rec) == 1);

} // namespace VOK::MemPool

#endif
