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
};

} // namespace

int main(int, char** argv) {
  engine.seed(static_cast<unsigned>(std::atoi(argv[1])));
  const auto steps = static_cast<unsigned>(std::atoi(argv[2]));
  const auto clears = static_cast<unsigned>(std::atoi(argv[3]));
  Pool pools[] = {Pool(argv[4]), Pool(argv[5])};
  Pool& first = pools[0];
  void* const foreign = pools[1].mgr.Alloc(1);
  for (unsigned i = 1; i <= steps; ++i) {
    pools[Below(2)].Step();
    if (first.mgr.IsEnabled()) { // the heap takes no misuse
      if (Below(20) == 0) first.mgr.Free(foreign);
      if (Below(20) == 0 && ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS()) {
        first.Alloc(1); // given back twice while its bucket stands
        first.mgr.Free(first.held.back());
        first.mgr.Free(first.held.back());
        first.held.pop_back();
      }
      if (Below(steps) < clears) { // proved where both requests get one address
        first.Alloc(1);
        first.mgr.Clear();
        first.held.clear();
        first.Alloc(1);
      }
    }
    if (i == steps / 2 || i == steps) DbgDetailed();
  }
}
