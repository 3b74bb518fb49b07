// The contender of std::pmr::unsynchronized_pool_resource.
#include "Contender.h"
#include "rivals/PmrPool.h"

int main(int argc, char** argv) { return Bench::Main<Bench::PmrPool>(argc, argv); }
