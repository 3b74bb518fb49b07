// Pools for threads that hand records on: each thread allocates from a pool of its own, and any
// thread frees. Nothing needs a lock but what the threads themselves share.
#include <MemPoolThreads>

#include <functional>
#include <iostream>
#include <list>
#include <numeric>
#include <thread>

using namespace VOK::MemPool;

namespace {

using Numbers = std::list<int, ThreadAllocator<int>>;

void Fill(Numbers& numbers, int count) {
  for (int i = 1; i <= count; ++i)
    numbers.push_back(i);
}

std::size_t UsedRecords(const char* name) { return GetMgr(name)->GetStats().usedRecords; }

} // namespace

int main() {
  ThreadPools pools("numbers", Options().On());
  Numbers mine(pools);
  Numbers theirs(pools);
  Fill(mine, 10);
  std::thread(Fill, std::ref(theirs), 1000).join();
  std::cout << "sum: " << std::accumulate(theirs.begin(), theirs.end(), 0) << '\n';
  std::cout << "numbers#1: " << UsedRecords("numbers#1") << " records in use\n";
  std::cout << "numbers#2: " << UsedRecords("numbers#2") << " records in use\n";

  // The thread of these records has ended. They wait in the inbox of its pool for the next thread
  // that takes the pool over, or for Collect.
  theirs.clear();
  std::cout << "numbers#2: " << UsedRecords("numbers#2") << " records in use, all freed\n";
  pools.Collect();
  std::cout << "numbers#2: " << UsedRecords("numbers#2") << " records in use after Collect\n";
}
