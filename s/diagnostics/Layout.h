// The library's description of its own layout: where the registry is, and where each structure has
// the fields that lead from there to every record. By it another process reads the pools of a
// running program or of a core file, without debug information.
// Test: tests/tools/inspect_test.py.
#ifndef VOK_MEMPOOL_LAYOUT_H
#define VOK_MEMPOOL_LAYOUT_H

#include "MemPool"

#include <cstdint>

namespace VOK::MemPool {

/// Offsets of fields, and sizes, in bytes.
struct Structures {
  struct {
    std::uint32_t name, pool, next, size;
  } entry; ///< of the registry; the name ends in a zero byte
  struct {
    std::uint32_t bucketMgr, size;
  } mgr;
  struct {
    std::uint32_t mgr, groups, extRecs, numGroups, numExtRecs, bucketSize, dataAlignment,
        maxRecSize, minRecSize, enabled, size;
  } bucketMgr;
  struct {
    std::uint32_t owner, head1, head2, numBuckets, numFreeBuckets, dataSize, size;
  } group;
  struct {
    std::uint32_t parent, next1, prev1, next2, prev2, recsSize, recSize, freeHead, freeRecs, size;
  } bucket; ///< records begin after it, and their offsets count from freeRecs
  struct {
    std::uint32_t offsetLow, offsetHigh, type, size;
  } rec;
  struct {
    std::uint32_t next, prev, length, tag0, tag1, type, tag3, size;
  } extRec; ///< data begins after it
  struct {
    std::uint32_t maxRequest, minBucketSize, maxBucketSize;
  } limits; ///< the figures of a report that no structure has
  struct {
    std::uint32_t held, peak, buckets;
  } budget; ///< 8 bytes each, from the start of the BucketMgr: bytes of the heap, and buckets
};

inline constexpr char layoutMagic[24] = "VokMemPoolLayout";
/// Changes with each change of the description's own form, and of what a field means.
inline constexpr std::uint32_t layoutFormat = 1;

/// The description has the same form at each width of a pointer. It holds its own address, by which
/// a search through memory distinguishes it from a copy, and which makes it part of a core file:
/// the loader relocates it.
template <class Pointer>
struct LayoutOf {
  char magic[sizeof layoutMagic];
  std::uint32_t format;
  std::uint32_t pointerSize;
  Pointer self;
  Pointer first; ///< of the pointer to the registry's first entry
  Structures structures;
  char version[64]; ///< the text of GetVersion
};

using Layout = LayoutOf<const void*>;

#ifdef _WIN32
extern const Layout layout;
#else
extern VOK_MEMPOOL_API const Layout layout;
#endif

} // namespace VOK::MemPool

#endif
