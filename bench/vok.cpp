// The benchmark program of this library.
#include "Harness.h"
#include "competitors/VokPool.h"

int main(int argc, char** argv) { return Bench::Main<Bench::VokPool>(argc, argv); }
