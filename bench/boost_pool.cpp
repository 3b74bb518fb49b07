// The benchmark program of boost::pool.
#include "Harness.h"
#include "competitors/BoostPool.h"

int main(int argc, char** argv) { return Bench::Main<Bench::BoostPool>(argc, argv); }
