// The benchmark program of this library's standard allocator over pools by thread.
#include "Harness.h"
#include "competitors/VokAllocator.h"

int main(int argc, char** argv) {
  using namespace VOK::MemPool;
  return Bench::Main<Bench::VokAllocator<ThreadPools, ThreadAllocator<std::uint64_t>>>(argc, argv);
}
