// The contender of the general heap.
#include "rivals/Heap.h"
#include "Contender.h"

int main(int argc, char** argv) { return Bench::Main<Bench::Heap>(argc, argv); }
