// The contender of this library.
#include "Contender.h"
#include "rivals/VokPool.h"

int main(int argc, char** argv) { return Bench::Main<Bench::VokPool>(argc, argv); }
