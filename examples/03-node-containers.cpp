// Node containers: the adaptors put standard containers and smart pointers into pools, with every
// alignment that a type needs. C++17.
#include <MemPoolAllocator>

#include <functional>
#include <iostream>
#include <list>
#include <map>
#include <memory>
#include <memory_resource>
#include <string>
#include <utility>

using namespace VOK::MemPool;

namespace {

template <class Key, class Value>
using Map = std::map<Key, Value, std::less<>, Allocator<std::pair<const Key, Value>>>;
template <class T>
using List = std::list<T, Allocator<T>>;

struct Shape {
  virtual ~Shape() = default;
  virtual const char* Name() const = 0;
};
struct Circle : Shape {
  const char* Name() const override { return "circle"; }
};

// The class's own new and delete use the pool "bolts", which its first use constructs.
struct Bolts {
  static constexpr const char* name = "bolts";
};
struct Bolt final : Pooled<Bolt, Bolts> {
  double length = 2.5;
};

} // namespace

int main() {
  ZOR_VOK_MEMPOOL_ON(true);
  Mgr nodes("nodes");
  Mgr shapes("shapes");

  // A container takes the pool as its allocator.
  Map<int, double> squareRoots(nodes);
  squareRoots[16] = 4;
  squareRoots[9] = 3;
  List<int> queue({3, 1, 2}, nodes);
  queue.sort();
  std::cout << "in " << squareRoots.get_allocator().Pool().GetName() << ": "
            << squareRoots.size() + queue.size() << " nodes, first root "
            << squareRoots.begin()->second << ", first in queue " << queue.front() << '\n';

  // A unique pointer frees its object in the pool, also through a pointer to the base.
  std::unique_ptr<Shape, Deleter<Shape>> shape = MakeUnique<Circle>(shapes);
  std::cout << "in " << shape.get_deleter().Pool().GetName() << ": a " << shape->Name() << '\n';

  // A container passes its memory resource on to the containers in it.
  Resource resource(nodes);
  std::pmr::map<std::pmr::string, std::pmr::list<int>> places(&resource);
  places["a word too long to be kept in the string"] = {1, 2, 3};
  std::cout << "places of the word: " << places.begin()->second.size() << '\n';

  const auto bolt = std::make_unique<Bolt>();
  std::cout << "in " << Bolt::Pool().GetName() << ": a bolt of " << bolt->length << '\n';
}
