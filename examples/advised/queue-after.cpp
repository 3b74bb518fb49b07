// queue-before.cpp with the best pool that was found, against the advice.
#include "Resident.h"

#include <MemPool>
#include <array>
#include <cstddef>
#include <cstring>
#include <iostream>
#include <random>

int main() {
  constexpr std::size_t waiting = 100, messages = 5000000;
  const long before = ResidentKiB();
  VOK::MemPool::Mgr pool("messages", VOK::MemPool::Options().On().DataAlignment(16));
  std::array<char*, waiting> queue{};
  std::minstd_rand random;
  std::size_t sum = 0;
  for (std::size_t i = 0; i < messages; ++i) {
    const auto size = static_cast<unsigned>(16 + random() % 400);
    char*& place = queue[i % waiting];
    pool.Free(place);
    place = static_cast<char*>(pool.Alloc(size));
    std::memset(&place[0], static_cast<int>(i), size);
    sum += static_cast<unsigned char>(place[0]);
  }
  std::cerr << "heap " << ResidentKiB() - before << " KiB\n";
  std::cout << sum << '\n';
}
