// queue-before.cpp with a pool, against the advice. The environment has the settings of the best
// one.
#include "Resident.h"

#include <MemPool>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <random>

int main(int argc, char** argv) {
  constexpr std::size_t waiting = 100;
  constexpr std::size_t messages = 3000000;
  const unsigned long sizes = argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 1000;
  const long before = ResidentKiB();
  VOK::MemPool::Mgr pool("messages", VOK::MemPool::Options().On());
  std::array<char*, waiting> queue{};
  std::minstd_rand random;
  std::size_t sum = 0;
  for (std::size_t i = 0; i < messages; ++i) {
    const auto size = static_cast<unsigned>(16 + random() % sizes);
    char*& place = queue[i % waiting];
    char* const made = static_cast<char*>(pool.Alloc(size));
    pool.Free(place);
    place = made;
    std::memset(&place[0], static_cast<int>(i), size);
    sum += static_cast<unsigned char>(place[0]);
  }
  std::cerr << "heap " << ResidentKiB() - before << " KiB\n";
  std::cout << sum << '\n';
}
