// What the fuzz targets share.
#ifndef VOK_MEMPOOL_FUZZ_TARGET_H
#define VOK_MEMPOOL_FUZZ_TARGET_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

inline void Demand(bool condition) {
  if (!condition) std::abort();
}

#endif
