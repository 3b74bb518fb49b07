// The contender of boost::pool.
#include "Contender.h"
#include "rivals/BoostPool.h"

int main(int argc, char** argv) { return Bench::Main<Bench::BoostPool>(argc, argv); }
