// How to keep a pointer in a record of a pool, which is aligned to 4 and no more.
#ifndef VOK_MEMPOOL_EXAMPLES_LINK_H
#define VOK_MEMPOOL_EXAMPLES_LINK_H

#include <bit>
#include <cstdint>

/// A pointer to keep in a record: as wide as any other, but aligned to 4.
template <class T>
class Link {
public:
  Link(T* target = nullptr) { *this = std::bit_cast<Link>(target); }
  operator T*() const { return std::bit_cast<T*>(*this); }
  T* operator->() const { return *this; }

private:
  std::uint32_t words[sizeof(T*) / sizeof(std::uint32_t)];
};

#endif
