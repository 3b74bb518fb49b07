// A pool of its own make: sizes for one pool, a limit at which it asks for room, and its figures.
#include <MemPool>

#include <cstddef>
#include <iostream>
#include <new>
#include <stdexcept>

using namespace VOK::MemPool;

namespace {

// A cache is dropped to make room, once.
bool DropCache(Mgr& pool, std::size_t, void* context) {
  bool& isCached = *static_cast<bool*>(context);
  std::cout << pool.GetName()
            << " has no room: " << (isCached ? "the cache is dropped" : "there is nothing to drop")
            << '\n';
  if (!isCached) return false;
  isCached = false;
  pool.Clear(); // all of it is the cache
  return true;
}

} // namespace

int main() {
  bool isCached = true;
  Mgr nodes("nodes", Options().On().MaxRecordSize(64).Limit(20000).AtLimit(DropCache, &isCached));
  try {
    while (true)
      nodes.Alloc(48);
  } catch (const std::bad_alloc&) {
    const Stats stats = nodes.GetStats();
    std::cout << stats.usedRecords << " records of " << stats.payload << " bytes in "
              << stats.buckets << " buckets\n";
  }

  std::size_t bytes = 0;
  ForEachRecord(nodes, [&](void*, unsigned size) { bytes += size; });
  std::cout << "visited: " << bytes << " bytes\n";
  nodes.Clear();

  try {
    const Mgr impossible("impossible", Options().On().BucketSize(500));
  } catch (const std::invalid_argument& error) {
    std::cout << error.what() << '\n';
  }
}
