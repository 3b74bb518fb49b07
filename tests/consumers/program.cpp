// What each consumer builds: both headers found, and the library linked and loaded.
#include <MemPool>
#include <MemPoolAllocator>

#include <iostream>
#include <list>

int main() {
  VOK::MemPool::ZOR_VOK_MEMPOOL_ON(true);
  VOK::MemPool::Mgr pool("consumer");
  const std::list<int, VOK::MemPool::Allocator<int>> numbers({1, 2, 3}, pool);
  const bool held = pool.Contains(&numbers.front()) || numbers.back() == 3;
  std::cout << pool.GetName() << ": " << numbers.size() << (held ? " held\n" : " lost\n");
}
