// graph-before.cpp as advised: the edges have a pool, and a graph that goes resets it.
#include "Resident.h"

#include <MemPoolAllocator>
#include <cstdint>
#include <iostream>
#include <vector>

namespace {

struct Edge {
  Edge* next;
  std::uint32_t to;
  float weight;
};

class Graph {
public:
  explicit Graph(std::uint32_t nodes) : first(nodes) {}
  ~Graph() { pool.Reset(); }
  Graph(const Graph&) = delete;
  Graph& operator=(const Graph&) = delete;

  void Connect(std::uint32_t from, std::uint32_t to) {
    first[from] = new (edges.allocate(1)) Edge{first[from], to, 1};
  }
  double Sum() const {
    double sum = 0;
    for (const Edge* edge : first)
      for (; edge != nullptr; edge = edge->next)
        sum += edge->weight;
    return sum;
  }

private:
  static inline VOK::MemPool::Mgr pool{"edges", VOK::MemPool::Options().On()};
  static inline VOK::MemPool::Allocator<Edge> edges{pool};
  std::vector<Edge*> first;
};

} // namespace

int main() {
  constexpr std::uint32_t nodes = 1000;
  constexpr std::uint32_t edges = 1000000;
  const long before = ResidentKiB();
  double sum = 0;
  for (int round = 0; round < 5; ++round) {
    Graph graph(nodes);
    for (std::uint32_t i = 0; i < edges; ++i)
      graph.Connect(i % nodes, i / nodes);
    sum += graph.Sum();
    if (round == 0) std::cerr << "heap " << ResidentKiB() - before << " KiB\n";
  }
  std::cout << sum << '\n';
}
