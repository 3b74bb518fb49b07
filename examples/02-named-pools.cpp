// Named pools: a name leads to its pool from anywhere in the process, and all pools can be listed.
#include <MemPool>

#include <iostream>
#include <vector>

using namespace VOK::MemPool;

namespace {

// Any library of the process can ask so, and needs no more than the name.
void Look(const char* name) {
  const Mgr* const pool = GetMgr(name);
  std::cout << name << (pool != nullptr ? " stands\n" : " doesn't stand\n");
}

void List() {
  std::vector<Mgr*> pools;
  GetMgrs(pools); // by ascending name, byte by byte
  std::cout << GetNumMgrs() << " pools:";
  for (const Mgr* pool : pools)
    std::cout << ' ' << pool->GetName();
  std::cout << '\n';
}

} // namespace

int main() {
  ZOR_VOK_MEMPOOL_ON(true);
  Mgr words("words");
  {
    Mgr lines("Lines"); // a name stands once: a second pool of it would end the process
    Mgr unnamed;        // gets a running name
    List();
    Look("Lines");
    Look("lines");
  } // a pool goes with its handle, and its name is free again
  List();
  Look("Lines");
}
