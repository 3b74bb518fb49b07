// A first pool: switch pooling on, make it, take a block and give it back.
#include <MemPool>

#include <iostream>

int main() {
  using namespace VOK::MemPool;
  Mgr early("early");       // pooling is off out of the box: this one passes all to the heap
  ZOR_VOK_MEMPOOL_ON(true); // counts for the pools built from here on
  Mgr words("words");
  std::cout << "early pools: " << early.IsEnabled() << '\n';
  std::cout << "words pools: " << words.IsEnabled() << '\n';

  void* p = words.Alloc(10);
  std::cout << "asked for 10 bytes, room for " << words.GetSize(p) << '\n';
  std::cout << "in words: " << words.Contains(p) << ", in early: " << early.Contains(p) << '\n';
  std::cout << "taken back: " << words.Free(p) << '\n';
}
