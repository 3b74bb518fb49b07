// Stops where pools and adaptors are in scope, for gdb_test.py.
#include <MemPool>
#include <MemPoolAllocator>
#include <MemPoolThreads>

using namespace VOK::MemPool;

struct alignas(64) Marked {};

int main() {
  Mgr words("words");
  [[maybe_unused]] const Mgr& reference = words;
  [[maybe_unused]] const Allocator<int> allocator(words);
  [[maybe_unused]] const Resource resource(words);
  [[maybe_unused]] const Deleter<Marked> deleter(words);
  [[maybe_unused]] const Deleter<int[]> arrayDeleter(words);
  ThreadPools threads("threads");
  [[maybe_unused]] const ThreadAllocator<int> threadAllocator(threads);
  [[maybe_unused]] const ThreadResource threadResource(threads);
  __builtin_trap();
}
