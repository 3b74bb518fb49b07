// The workloads of the standard containers' nodes, over an allocator that keeps alignof(T).
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

/// An allocator of a rival. Where the rival aligns to less than T needs, it brings a way of its
/// own.
template <class T, class Rival>
class NodeAllocator {
public:
  using value_type = T;

  explicit NodeAllocator(Rival& rival_) : rival(&rival_) {}
  template <class U>
  explicit NodeAllocator(const NodeAllocator<U, Rival>& other) : rival(other.rival) {}

  T* allocate(std::size_t n) {
    const std::uint32_t size = SizeOf(n);
    if constexpr (alignof(T) <= Rival::alignment)
      return static_cast<T*>(rival->Alloc(size));
    else
      return static_cast<T*>(rival->AllocAligned8(size));
  }

  void deallocate(T* p, std::size_t n) {
    const std::uint32_t size = SizeOf(n);
    if constexpr (alignof(T) <= Rival::alignment)
      rival->Free(p, size);
    else
      rival->FreeAligned8(p, size);
  }

  friend bool operator==(const NodeAllocator& a, const NodeAllocator& b) {
    return a.rival == b.rival;
  }

private:
  template <class, class>
  friend class NodeAllocator;
  static_assert(alignof(T) <= 8);

  static std::uint32_t SizeOf(std::size_t n) {
    return static_cast<std::uint32_t>(n * sizeof(T)); // NOLINT(bugprone-sizeof-expression)
  }

  Rival* rival;
};

/// A thousand keys in an order without a pattern, and none twice.
inline std::vector<std::uint32_t> Keys() {
  std::vector<std::uint32_t> keys;
  for (std::uint32_t i = 0; i < 1000; ++i)
    keys.push_back(i * 2654435761U);
  return keys;
}

/// Each key entered, then each looked up and erased, in another order.
template <class Map, class Rival>
class MapNodes {
public:
  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      Map map{typename Map::allocator_type(rival)};
      for (const std::uint32_t key : keys)
        map.emplace(key, key + time);
      for (std::size_t i = 0; i < keys.size(); ++i) {
        const auto found = map.find(keys[(i * 7) % keys.size()]);
        if (found == map.end()) continue; // then the checksum tells
        sum += found->second;
        map.erase(found);
      }
    }
    return sum;
  }

private:
  static_assert(std::is_same_v<typename Map::key_type, std::uint32_t>);

  Rival rival;
  std::vector<std::uint32_t> keys = Keys();
};

template <class Rival>
using TreeNodes =
    MapNodes<std::map<std::uint32_t, std::uint32_t, std::less<>,
                      NodeAllocator<std::pair<const std::uint32_t, std::uint32_t>, Rival>>,
             Rival>;

template <class Rival>
using HashNodes = MapNodes<
    std::unordered_map<std::uint32_t, std::uint32_t, std::hash<std::uint32_t>, std::equal_to<>,
                       NodeAllocator<std::pair<const std::uint32_t, std::uint32_t>, Rival>>,
    Rival>;

/// A list filled at its end and emptied from its head.
template <class Rival>
class ListNodes {
public:
  std::uint32_t Run(std::uint32_t times) {
    std::uint32_t sum = 0;
    for (std::uint32_t time = 0; time < times; ++time) {
      List list{typename List::allocator_type(rival)};
      for (const std::uint32_t key : keys)
        list.push_back(key + time);
      for (; !list.empty(); list.pop_front())
        sum += list.front();
    }
    return sum;
  }

private:
  using List = std::list<std::uint32_t, NodeAllocator<std::uint32_t, Rival>>;

  Rival rival;
  std::vector<std::uint32_t> keys = Keys();
};

} // namespace Bench

#endif
