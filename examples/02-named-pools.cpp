// Named pools: code anywhere in the process finds a pool by its name, and can list all pools.
#include <MemPool>

#include <iostream>
#include <vector>

using namespace VOK::MemPool;

namespace {

// Any library of the process can look a pool up; the name is all that it needs.
void Look(const char* name) {
  const Mgr* const pool = GetMgr(name);
  std::cout << name << (pool != nullptr ? " exists\n" : " doesn't exist\n");
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
    Mgr lines("Lines"); // names are unique: a second pool "Lines" would end the process
    Mgr unnamed;        // gets an automatic name
    List();
    Look("Lines");
    Look("lines");
  } // the handles destroy their pools, and the names are free again
  List();
  Look("Lines");
}
