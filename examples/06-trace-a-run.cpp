// Trace a run: each event of a pool writes a line. docs/messages.md explains the lines, and the
// program vokmempool summarises them. ZOR_VOK_MEMPOOL_TRACE=1 in the environment traces any
// program.
#include <MemPool>

int main() {
  using namespace VOK::MemPool;
  ZOR_VOK_MEMPOOL_ON(true);
  ZOR_VOK_MEMPOOL_TRACE(true);
  Mgr pool("pool");
  Mgr other("other");
  void* small = pool.Alloc(10);
  void* large = pool.Alloc(2000);
  pool.Alloc(0);
  void* theirs = other.Alloc(10);
  pool.Free(small);
  other.Free(theirs);
  pool.Free(large);
  pool.Free(nullptr); // no line
  pool.Clear();       // no line
}
