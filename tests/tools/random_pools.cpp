// A program whose two pools work at random: what the library writes of them is what vokmempool
// reads. Behind each half of the steps it prints the pools in detail.
//
// usage: random_pools SEED STEPS CLEARS NAME NAME
#include <MemPool>

#include <cstdlib>
#include <random>
#include <utility>
#include <vector>

namespace {

using namespace VOK::MemPool;

std::mt19937 engine;

unsigned Below(std::size_t end) { return static_cast<unsigned>(engine() % end); }

struct Pool {
  Mgr mgr;
  std::vector<void*> held;

  explicit Pool(const char* name) : mgr(name) {}

  void Alloc(unsigned size) { held.push_back(mgr.Alloc(size)); }

  void Step() {
    const unsigned largest = ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE();
    if (held.empty() || Below(5) < 3)
      return Alloc(1 + Below(Below(8) == 0 ? 2 * largest : largest / 3));
    std::swap(held[Below(held.size())], held.back());
    mgr.Free(held.back());
    held.pop_back();
  }

  /// A record of another pool, and one a second time while its bucket stands.
  void Misuse(void* foreign) {
    mgr.Free(foreign);
    if (!ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS()) return;
    void* const twice = mgr.Alloc(1);
    mgr.Free(twice);
    mgr.Free(twice);
  }

  /// The requests around it are likely to get one address, which proves the Clear.
  void Clear() {
    Alloc(1);
    mgr.Clear();
    held.clear();
    Alloc(1);
  }
};

} // namespace

int main(int, char** argv) {
  engine.seed(static_cast<unsigned>(std::atoi(argv[1])));
  const int steps = std::atoi(argv[2]);
  const int clears = std::atoi(argv[3]);
  Pool pools[] = {Pool(argv[4]), Pool(argv[5])};
  void* const foreign = pools[1].mgr.Alloc(1);
  for (int i = 1; i <= steps; ++i) {
    pools[Below(2)].Step();
    if (pools[0].mgr.IsEnabled()) { // the heap takes no misuse
      if (Below(20) == 0) pools[0].Misuse(foreign);
      if (static_cast<int>(Below(static_cast<unsigned>(steps))) < clears) pools[0].Clear();
    }
    if (i == steps / 2 || i == steps) DbgDetailed();
  }
}
