// A first pool: enable pooling, construct a pool, allocate a block and free it.
#include <MemPool>

#include <iostream>

int main() {
  using namespace VOK::MemPool;
  Mgr early("early");       // pooling is off by default: this pool passes every request to the heap
  ZOR_VOK_MEMPOOL_ON(true); // applies to pools constructed from here on
  Mgr words("words");
  std::cout << "early pools: " << early.IsEnabled() << '\n';
  std::cout << "words pools: " << words.IsEnabled() << '\n';

  void* p = words.Alloc(10);
  std::cout << "10 bytes requested, capacity " << words.GetSize(p) << '\n';
  std::cout << "in words: " << words.Contains(p) << ", in early: " << early.Contains(p) << '\n';
  std::cout << "freed: " << words.Free(p) << '\n';
}
