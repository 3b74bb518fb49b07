// The exported functions that find pools by name or list all of them.
// Test: tests/registry_test.cpp.
#include "MemPool"

#include "services/MgrRegistry.h"

namespace VOK::MemPool {

Mgr* GetMgr(const char* name) {
  const BucketMgr* const pool = MgrRegistry::Find(name != nullptr ? name : "");
  return pool != nullptr ? MgrRegistry::HandleOf(pool) : nullptr;
}

void GetMgrs(vector<Mgr*>& mgrs) {
  mgrs.Reserve(GetNumMgrs());
  for (const auto& [name, pool] : MgrRegistry::Entries())
    mgrs.Append(MgrRegistry::HandleOf(pool));
}

void GetMgrs(std::vector<Mgr*>& mgrs) {
  mgrs.reserve(GetNumMgrs());
  for (const auto& [name, pool] : MgrRegistry::Entries())
    mgrs.push_back(MgrRegistry::HandleOf(pool));
}

unsigned GetNumMgrs() { return static_cast<unsigned>(MgrRegistry::Entries().size()); }

} // namespace VOK::MemPool
