// The map's life, its lock, and the automatic names.
// Test: tests/registry_test.cpp, tests/threads_test.cpp.
#include "services/MgrRegistry.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <iterator>
#include <map>
#include <mutex>
#include <new>
#include <utility>

#ifdef __unix__
#include <pthread.h>
#endif

namespace VOK::MemPool::MgrRegistry {

namespace {

using Map = std::map<std::string, Entry, std::less<>>;
using Lock = std::lock_guard<std::mutex>;

struct Registry {
  std::mutex mutex;
  Map pools; // by name
};

// Storage without a life: it begins by Begin and is never destroyed.
alignas(Registry) std::byte storage[sizeof(Registry)];

Registry& Shared() { return *std::launder(reinterpret_cast<Registry*>(storage)); }

std::atomic<std::uint32_t> nextMgrId = 1;

/// The pointer that leads to an entry of the map: the head of the list, or that of the entry
/// before.
Entry*& LinkTo(Map::iterator entry) {
  return entry == Shared().pools.begin() ? first : std::prev(entry)->second.next;
}

} // namespace

Entry* first = nullptr;

// A child process has the one thread that forked. If another one held the lock in that moment,
// nobody would release it there: so the fork waits for it.
void Begin() {
  new (storage) Registry;
#ifdef __unix__
  pthread_atfork([] { Shared().mutex.lock(); }, [] { Shared().mutex.unlock(); },
                 [] { Shared().mutex.unlock(); });
#endif
}

void End() noexcept {
  Map left;
  const Lock lock(Shared().mutex);
  left.swap(Shared().pools);
  first = nullptr;
}

bool Contains(std::string_view name) {
  const Lock lock(Shared().mutex);
  return Shared().pools.find(name) != Shared().pools.end();
}

Mgr* Find(std::string_view name) {
  const Lock lock(Shared().mutex);
  const auto entry = Shared().pools.find(name);
  return entry != Shared().pools.end() ? HandleOf(entry->second.pool) : nullptr;
}

unsigned Count() {
  const Lock lock(Shared().mutex);
  return static_cast<unsigned>(Shared().pools.size());
}

// Other threads may make pools between the reservation and the lock.
std::vector<Mgr*> Handles() {
  std::vector<Mgr*> handles;
  while (true) {
    handles.reserve(Count());
    const Lock lock(Shared().mutex);
    if (Shared().pools.size() > handles.capacity()) continue;
    for (const Entry* entry = first; entry != nullptr; entry = entry->next)
      handles.push_back(HandleOf(entry->pool));
    return handles;
  }
}

bool Enter(const std::string& name, BucketMgr* pool) {
  Map made;
  const auto entry = made.emplace(name, Entry{nullptr, pool, nullptr}).first;
  entry->second.name = entry->first.c_str();
  const Lock lock(Shared().mutex);
  Shared().pools.merge(made);
  if (!made.empty()) return false;
  entry->second.next = std::exchange(LinkTo(entry), &entry->second);
  return true;
}

void Remove(std::string_view name) noexcept {
  Map::node_type gone;
  const Lock lock(Shared().mutex);
  const auto entry = Shared().pools.find(name);
  if (entry == Shared().pools.end()) return;
  LinkTo(entry) = entry->second.next;
  gone = Shared().pools.extract(entry);
}

std::string NextAutomaticName() {
  const std::string number = std::to_string(nextMgrId++);
  const std::size_t width = 5;
  return "__VOK_MEMPOOL_" + std::string(width - std::min(width, number.size()), '0') + number;
}

} // namespace VOK::MemPool::MgrRegistry
