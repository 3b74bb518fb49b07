// Read a report: what a pool holds, by size, by bucket and by large block. docs/reports.md explains
// each line.
#include <MemPool>

using namespace VOK::MemPool;

int main() {
  ZOR_VOK_MEMPOOL_ON(true);
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(120); // small buckets, for a report of one page
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(100);
  Mgr pool("orders");
  void* orders[6]; // four to a bucket
  for (void*& order : orders)
    order = pool.Alloc(20);
  for (int i = 0; i < 4; ++i)
    pool.Alloc(50); // rounded up to 52, two to a bucket
  pool.Alloc(500);  // larger than any record: an ext record, a heap block of its own
  pool.Free(orders[1]);

  // The first lines are a summary: 9 records are used in 4 buckets, and 1 block is large. HISTOGRAM
  // shows the sizes in use, BUCKETS how full each bucket is, FREE BUCKETS which one serves next.
  pool.Dbg();
  pool.Clear();
}
