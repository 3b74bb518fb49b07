// A pool for each thread: the library has no locks, so only one thread at a time may use a pool,
// and only one at a time may construct, list and destroy pools.
#include <MemPool>

#include <deque>
#include <iostream>
#include <thread>
#include <vector>

using namespace VOK::MemPool;

namespace {

struct Worker {
  Mgr pool; // a pool must not move, and a deque doesn't move its elements
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
  std::deque<Worker> workers; // all pools exist before the threads start
  for (const char* name : {"north", "south"})
    workers.emplace_back(name);
  for (Worker& worker : workers)
    worker.thread = std::thread([&worker] { worker.Fill(10000); });
  for (Worker& worker : workers)
    worker.thread.join();

  // After the join, this thread may use the pools.
  for (Worker& worker : workers) {
    unsigned freed = 0;
    for (void* record : worker.records)
      if (worker.pool.Free(record)) ++freed;
    std::cout << worker.pool.GetName() << ": " << freed << " records freed\n";
  }
}
