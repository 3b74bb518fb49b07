// The entry of a fuzz target, which its fuzzer and the replay of its corpus call.
#ifndef VOK_MEMPOOL_FUZZ_TARGET_H
#define VOK_MEMPOOL_FUZZ_TARGET_H

#include <cstddef>
#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

#endif
