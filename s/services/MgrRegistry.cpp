// The map's life, its lock, and the automatic names.
// Test: tests/registry_test.cpp, tests/threads_test.cpp.
#include "services/MgrRegistry.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <new>

#ifdef __unix__
#include <pthread.h>
#endif

namespace VOK::MemPool::MgrRegistry {

namespace {

using Map = std::map<std::string, BucketMgr*, std::less<>>;

// The map's storage without its life: it begins by Begin and is never destroyed.
alignas(Map) std::byte storage[sizeof(Map)];

Map& Registry() { return *std::launder(reinterpret_cast<Map*>(storage)); }

std::mutex mutex;
using Lock = std::lock_guard<std::mutex>;

std::atomic<std::uint32_t> nextMgrId = 1;

} // namespace

// A child process has the one thread that forked. If another one held the lock in that moment,
// nobody would release it there: so the fork waits for it.
void Begin() {
  new (storage) Map;
#ifdef __unix__
  pthread_atfork([] { mutex.lock(); }, [] { mutex.unlock(); }, [] { mutex.unlock(); });
#endif
}

void End() noexcept {
  Map left;
  const Lock lock(mutex);
  left.swap(Registry());
}

bool Contains(std::string_view name) {
  const Lock lock(mutex);
  return Registry().find(name) != Registry().end();
}

Mgr* Find(std::string_view name) {
  const Lock lock(mutex);
  const auto entry = Registry().find(name);
  return entry != Registry().end() ? HandleOf(entry->second) : nullptr;
}

unsigned Count() {
  const Lock lock(mutex);
  return static_cast<unsigned>(Registry().size());
}

// Other threads may make pools between the reservation and the lock.
std::vector<Mgr*> Handles() {
  std::vector<Mgr*> handles;
  while (true) {
    handles.reserve(Count());
    const Lock lock(mutex);
    if (Registry().size() > handles.capacity()) continue;
    for (const auto& [name, pool] : Registry())
      handles.push_back(HandleOf(pool));
    return handles;
  }
}

bool Enter(const std::string& name, BucketMgr* pool) {
  Map made;
  made.emplace(name, pool);
  const Lock lock(mutex);
  Registry().merge(made);
  return made.empty();
}

void Remove(std::string_view name) noexcept {
  Map::node_type gone;
  const Lock lock(mutex);
  const auto entry = Registry().find(name);
  if (entry != Registry().end()) gone = Registry().extract(entry);
}

std::string NextAutomaticName() {
  const std::string number = std::to_string(nextMgrId++);
  const std::size_t width = 5;
  return "__VOK_MEMPOOL_" + std::string(width - std::min(width, number.size()), '0') + number;
}

} // namespace VOK::MemPool::MgrRegistry
