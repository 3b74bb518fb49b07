// The exported functions that find pools by name or list all of them.
// Test: tests/registry_test.cpp.
#include "MemPool"

#include "services/MgrRegistry.h"

namespace VOK::MemPool {

Mgr* GetMgr(const char* name) { return MgrRegistry::Find(name != nullptr ? name : ""); }

void GetMgrs(vector<Mgr*>& mgrs) {
  const std::vector<Mgr*> all = MgrRegistry::Handles();
  mgrs.Reserve(static_cast<unsigned>(all.size()));
  for (Mgr* const mgr : all)
    mgrs.Append(mgr);
}

void GetMgrs(std::vector<Mgr*>& mgrs) {
  const std::vector<Mgr*> all = MgrRegistry::Handles();
  mgrs.reserve(all.size());
  for (Mgr* const mgr : all)
    mgrs.push_back(mgr);
}

unsigned GetNumMgrs() { return MgrRegistry::Count(); }

} // namespace VOK::MemPool
