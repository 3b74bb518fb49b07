// The used sizes of a report: how many live records there are of each. It is filled again for each
// report, from the standard allocator, so that a report changes no figure that it prints. A struct
// around the map, since the engine's headers name it without a look inside.
// Test: tests/report_test.cpp.
#ifndef VOK_MEMPOOL_SIZEFREQMAP_H
#define VOK_MEMPOOL_SIZEFREQMAP_H

#include <cstdint>
#include <map>

namespace VOK::MemPool {

struct SizeFreqMap {
  std::map<std::uint32_t, std::uint32_t> frequencies; ///< from data size to number of records

  /// Counts `records` records of one size, with one search for all of them.
  void Count(std::uint32_t size, std::uint32_t records) {
    if (records > 0) frequencies[size] += records;
  }
};

} // namespace VOK::MemPool

#endif
