// The fast path of a request alone: pairs of Alloc and Free of one record, over 4,000 live records
// under the default settings.
//   pair/N   N pairs; scripts/checks/fast-path takes the difference of two N
#include <MemPool>

#include <benchmark/benchmark.h>

#include <vector>

namespace {

void Pair(benchmark::State& state) {
  VOK::MemPool::ZOR_VOK_MEMPOOL_ON(true);
  VOK::MemPool::Mgr pool;
  for (int i = 0; i < 4000; ++i)
    pool.Alloc(24);
  for (auto _ : state) { // NOLINT(clang-analyzer-deadcode.DeadStores): the benchmark's own form
    void* const p = pool.Alloc(24);
    benchmark::DoNotOptimize(p);
    pool.Free(p);
  }
}
BENCHMARK(Pair)->Name("pair/1000000")->Iterations(1000000);
BENCHMARK(Pair)->Name("pair/2000000")->Iterations(2000000);

} // namespace

BENCHMARK_MAIN();
