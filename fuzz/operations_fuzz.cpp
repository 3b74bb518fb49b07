// Bytes as calls on pools at settings of all kinds: each call equals the reference's, and the
// invariants hold after it.
#include "Target.h"
#include "support/Operations.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static ArenaHeap heap; // a fresh one would cost more than the calls
  const std::uint8_t* const end = data + size;
  Operations(heap, [&] { return data != end ? *data++ : -1; }).Run();
  return 0;
}
