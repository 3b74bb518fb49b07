// A pool for each thread: nothing is locked, so one pool belongs to one thread at a time, and pools
// are made, listed and destroyed by one thread at a time.
#include <MemPool>

#include <deque>
#include <iostream>
#include <thread>
#include <vector>

using namespace VOK::MemPool;

namespace {

struct Worker {
  Mgr pool; // a pool stays where it was built, as the elements of a deque do
  std::vector<void*> records;
  std::thread thread;

  explicit Worker(const char* name) : pool(name) {}

  void Fill(unsigned number) {
    for (unsigned i = 0; i < number; ++i)
      records.push_back(pool.Alloc(24));
  }
};

} // namespace

int main() {
  ZOR_VOK_MEMPOOL_ON(true);
  std::deque<Worker> workers; // all pools are made ahead of the threads
  for (const char* name : {"north", "south"})
    workers.emplace_back(name);
  for (Worker& worker : workers)
    worker.thread = std::thread([&worker] { worker.Fill(10000); });
  for (Worker& worker : workers)
    worker.thread.join();

  // Behind the join, the pools are this thread's.
  for (Worker& worker : workers) {
    unsigned taken = 0;
    for (void* record : worker.records)
      if (worker.pool.Free(record)) ++taken;
    std::cout << worker.pool.GetName() << ": " << taken << " records taken back\n";
  }
}
