// The benchmark program of std::pmr::synchronized_pool_resource.
#include "Harness.h"
#include "competitors/PmrPool.h"

int main(int argc, char** argv) {
  return Bench::Main<Bench::PmrPool<std::pmr::synchronized_pool_resource>>(argc, argv);
}
