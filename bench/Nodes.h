// The workloads of the standard containers' nodes, over an allocator that returns memory aligned to
// alignof(T).
#ifndef VOK_BENCH_NODES_H
#define VOK_BENCH_NODES_H

#include "Record.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <list>
#include <map>
#include <type_traits>
#include <unordered_map>
#include <utility>
#include <vector>

namespace Bench {

/// A standard allocator over an allocator under test. One that aligns to less than T needs has
/// functions of its own for that.
template <class T, class Allocator>
class NodeAllocator {
public:
  using value_type = T;

  explicit NodeAllocator(Allocator& allocator_) : allocator(&allocator_) {}
  template <class U>
  explicit NodeAllocator(const NodeAllocator<U, Allocator>& other) : allocator(other.allocator) {}

  T* allocate(std::size_t n) {
    const std::uint32_t size = SizeOf(n);
    if constexpr (alignof(T) <= Allocator::alignment)
      return static_cast<T*>(allocator->Alloc(size));
    else
      return static_cast<T*>(allocator->AllocAligned8(size));
  }

  void deallocate(T* p, std::size_t n) {
    const std::uint32_t size = SizeOf(n);
    if constexpr (alignof(T) <= Allocator::alignment)
      allocator->Free(p, size);
    else
      allocator->FreeAligned8(p, size);
  }

  friend bool operator==(const NodeAllocator& a, const NodeAllocator& b) {
    return a.allocator == b.allocator;
  }

private:
  template <class, class>
  friend class NodeAllocator;
  static_assert(alignof(T) <= 8);

  static std::uint32_t SizeOf(std::size_t n) {
    return static_cast<std::uint32_t>(n * sizeof(T)); // NOLINT(bugprone-sizeof-expression)
  }

  Allocator* allocator;
};

/// A thousand distinct keys, in an order without a pattern.
inline std::vector<std::uint32_t> Keys() {
  std::vector<std::uint32_t> keys;
  for (std::uint32_t i = 0; i < 1000; ++i)
    keys.push_back(i * 2654435761U);
  return keys;
}

/// Inserts each key, then looks up and erases each in another order.
template <class Map, class Allocator>
class MapNodes {
public:
  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      Map map{typename Map::allocator_type(allocator)};
      for (const std::uint32_t key : keys)
        map.emplace(key, key + time);
      for (std::size_t i = 0; i < keys.size(); ++i) {
        const auto found = map.find(keys[(i * 7) % keys.size()]);
        if (found == map.end()) continue; // the checksum shows it
        sum += found->second;
        map.erase(found);
      }
    }
    return sum;
  }

private:
  static_assert(std::is_same_v<typename Map::key_type, std::uint32_t>);

  Allocator allocator;
  std::vector<std::uint32_t> keys = Keys();
};

template <class Allocator>
using TreeNodes =
    MapNodes<std::map<std::uint32_t, std::uint32_t, std::less<>,
                      NodeAllocator<std::pair<const std::uint32_t, std::uint32_t>, Allocator>>,
             Allocator>;

template <class Allocator>
using HashNodes = MapNodes<
    std::unordered_map<std::uint32_t, std::uint32_t, std::hash<std::uint32_t>, std::equal_to<>,
                       NodeAllocator<std::pair<const std::uint32_t, std::uint32_t>, Allocator>>,
    Allocator>;

/// Fills a list at its end and empties it from its head.
template <class Allocator>
class ListNodes {
public:
  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      List list{typename List::allocator_type(allocator)};
      for (const std::uint32_t key : keys)
        list.push_back(key + time);
      for (; !list.empty(); list.pop_front())
        sum += list.front();
    }
    return sum;
  }

private:
  using List = std::list<std::uint32_t, NodeAllocator<std::uint32_t, Allocator>>;

  Allocator allocator;
  std::vector<std::uint32_t> keys = Keys();
};

} // namespace Bench

#endif
