// The map's life, and the automatic names.
// Test: tests/registry_test.cpp.
#include "services/MgrRegistry.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <new>

namespace VOK::MemPool::MgrRegistry {

namespace {

// The map's storage without its life: it begins by Begin and is never destroyed.
alignas(Map) std::byte storage[sizeof(Map)];

Map& Registry() { return *std::launder(reinterpret_cast<Map*>(storage)); }

std::uint32_t nextMgrId = 1;

} // namespace

void Begin() { new (storage) Map; }

void End() noexcept { Registry().clear(); }

const Map& Entries() { return Registry(); }

BucketMgr* Find(std::string_view name) {
  const auto entry = Registry().find(name);
  return entry != Registry().end() ? entry->second : nullptr;
}

void Enter(const std::string& name, BucketMgr* pool) { Registry().emplace(name, pool); }

void Remove(const std::string& name) noexcept { Registry().erase(name); }

std::string NextAutomaticName() {
  const std::string number = std::to_string(nextMgrId++);
  const std::size_t width = 5;
  return "__VOK_MEMPOOL_" + std::string(width - std::min(width, number.size()), '0') + number;
}

} // namespace VOK::MemPool::MgrRegistry
