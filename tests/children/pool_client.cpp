// A library that uses the library, with two pools in static objects.
#include "pool_client.h"

#include "Script.h"

#include <MemPool>

namespace {

using namespace VOK::MemPool;

Mgr named("client");
Mgr nameless;

Mgr* Make() {
  Mgr* const mgr = new Mgr;
  Say(std::string("made ") + mgr->GetName());
  return mgr;
}

void Report(Mgr* mgr) {
  Say(std::to_string(GetNumMgrs()) + " pools, " +
      (GetMgr(mgr->GetName()) == mgr ? "found" : "not found"));
  void* const block = mgr->Alloc(10);
  Say(mgr->GetSize(block) == 12 && mgr->Free(block) ? "served" : "not served");
}

} // namespace

const PoolClient poolClient = {
    Make,
    Report,
    [](Mgr* mgr) { delete mgr; },
    [](Mgr* mgr) { mgr->Alloc(0x40000000); },
};
