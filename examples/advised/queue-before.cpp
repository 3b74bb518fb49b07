// Messages of many sizes that are written and wait in a short queue: few are live at a time. An
// argument sets the number of sizes.
#include "Resident.h"

#include <array>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <memory>
#include <random>

int main(int argc, char** argv) {
  constexpr std::size_t waiting = 100;
  constexpr std::size_t messages = 3000000;
  const unsigned long sizes = argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 1000;
  const long before = ResidentKiB();
  std::array<std::unique_ptr<char[]>, waiting> queue;
  std::minstd_rand random;
  std::size_t sum = 0;
  for (std::size_t i = 0; i < messages; ++i) {
    const std::size_t size = 16 + random() % sizes;
    std::unique_ptr<char[]>& place = queue[i % waiting];
    place.reset(new char[size]);
    std::memset(&place[0], static_cast<int>(i), size);
    sum += static_cast<unsigned char>(place[0]);
  }
  std::cerr << "heap " << ResidentKiB() - before << " KiB\n";
  std::cout << sum << '\n';
}
