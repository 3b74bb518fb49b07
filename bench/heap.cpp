// The benchmark program of the general heap.
#include "competitors/Heap.h"
#include "Harness.h"

int main(int argc, char** argv) { return Bench::Main<Bench::Heap>(argc, argv); }
