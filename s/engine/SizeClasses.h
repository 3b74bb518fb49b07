// From sizes to size classes: the limits, the rounding, the normalising of a pool's smallest and
// largest record, and the index of a size in the table of classes. All of it is pure arithmetic.
// Test: tests/sizeclass_test.cpp.
#ifndef VOK_MEMPOOL_SIZECLASSES_H
#define VOK_MEMPOOL_SIZECLASSES_H

#include "MemPool"

#include <bit>
#include <cstdint>

namespace VOK::MemPool {

/// The largest record area of a bucket, whose size and offsets are 16 bits wide.
inline constexpr std::uint32_t maxBucketSize = 65535;
/// The largest data alignment, a setting of 16 bits.
inline constexpr std::uint32_t maxDataAlignment = 65535;
/// The bookkeeping before each record's data.
inline constexpr std::uint32_t recHeaderSize = 4;

static_assert(std::uint64_t{maxRequest} + maxDataAlignment + recHeaderSize <= UINT32_MAX,
              "a rounded request and its header stay within 32 bits");

/// The smallest multiple of `multiple` that is at least `value`; `multiple` itself for 0.
/// REQUIRES: `multiple` is not 0, and the result fits.
template <class Unsigned>
constexpr Unsigned RoundUp(Unsigned value, std::uint32_t multiple) {
  const Unsigned x = value > 0 ? value - 1 : 0;
  return x - x % multiple + multiple;
}

/// The sizes of the smallest and the largest record of a pool, header included. They are 64 bits
/// wide, so that no setting wraps before it is tested.
struct RecSizeRange {
  std::uint64_t min;
  std::uint64_t max;
};

/// Moves both settings to multiples of `alignment`: the minimum up, the maximum down.
constexpr RecSizeRange Normalise(std::uint32_t minSetting, std::uint32_t maxSetting,
                                 std::uint32_t alignment) {
  RecSizeRange range{RoundUp(std::uint64_t{minSetting}, alignment),
                     RoundUp(std::uint64_t{maxSetting}, alignment)};
  if (range.max > maxSetting) range.max -= alignment;
  return range;
}

/// The index of the class that serves `dataSize` bytes, a multiple of `alignment`. Sizes below the
/// smallest record are clamped up to it and share index 0.
constexpr std::uint32_t RecSizeIndex(std::uint32_t dataSize, std::uint32_t minRecSize,
                                     std::uint32_t alignment) {
  const std::uint32_t recSize = dataSize + recHeaderSize;
  return recSize < minRecSize ? 0 : (recSize - minRecSize) / alignment;
}

/// The data size that the class at index 0 must hold: the largest that is clamped up to it and
/// still fits in a record of the pool. REQUIRES: a record of `alignment` data bytes fits in
/// `maxRecSize` and has the index 0.
constexpr std::uint32_t LargestAtIndex0(std::uint32_t minRecSize, std::uint32_t maxRecSize,
                                        std::uint32_t alignment) {
  std::uint32_t dataSize = minRecSize;
  while (RecSizeIndex(dataSize, minRecSize, alignment) > 0 || dataSize + recHeaderSize > maxRecSize)
    dataSize -= alignment;
  return dataSize;
}

/// From a size to its index on the fast path: a shift and a subtraction in place of the rounding,
/// two compares and a division.
///
/// It holds for sizes that have a class of their own. For all others, and for all sizes of a pool
/// whose alignment is no power of two, it gives an index beyond the table or one whose entry stays
/// null, and the request takes the general mapping: size 0 (size - 1 wraps), sizes that are
/// clamped up to the minimum (the bias makes them wrap), sizes above the largest record.
struct FastIndex {
  std::uint8_t shift;
  std::int8_t bias;

  constexpr std::uint32_t IndexOf(std::uint32_t size) const {
    return ((size - 1) >> shift) - static_cast<std::uint32_t>(std::int32_t{bias});
  }
};

/// Leads every size beyond the table.
inline constexpr FastIndex noFastIndex{31, 127};

/// The fast index of a pool with these normalised sizes.
constexpr FastIndex MakeFastIndex(std::uint32_t minRecSize, std::uint32_t maxRecSize,
                                  std::uint32_t alignment) {
  if (!std::has_single_bit(alignment)) return noFastIndex;
  // With one class and an alignment above the header's size, a size of `maxRecSize` bytes would
  // reach the class, though its record doesn't fit.
  if (minRecSize == maxRecSize && alignment > recHeaderSize) return noFastIndex;
  const auto bias = static_cast<std::int32_t>(minRecSize / alignment) - 1 -
                    static_cast<std::int32_t>(recHeaderSize / alignment);
  if (bias > INT8_MAX) return noFastIndex;
  return {static_cast<std::uint8_t>(std::countr_zero(alignment)), static_cast<std::int8_t>(bias)};
}

} // namespace VOK::MemPool

#endif
