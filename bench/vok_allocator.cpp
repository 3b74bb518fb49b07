// The benchmark program of this library's standard allocator over one pool.
#include "Harness.h"
#include "competitors/VokAllocator.h"

int main(int argc, char** argv) {
  using namespace VOK::MemPool;
  return Bench::Main<Bench::VokAllocator<Mgr, Allocator<std::uint64_t>>>(argc, argv);
}
