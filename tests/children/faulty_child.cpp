// A client that makes one fault with a pool's record, for a checker to find; the name of the fault
// is its argument. What the library itself can tell, it prints.
#include <MemPool>

#include <cstring>
#include <iostream>
#include <string>

namespace {

using VOK::MemPool::Mgr;

char* Make(Mgr& pool, unsigned size) {
  auto* const p = static_cast<char*>(pool.Alloc(size));
  std::memset(p, 1, size);
  return p;
}

// The compiler must not drop a write that nobody reads.
void Write(char* p) { *static_cast<volatile char*>(p) = 2; }

void Overrun(Mgr& pool) { Write(Make(pool, 9) + 9); } // into the slack of a record of 12 bytes
void Underrun(Mgr& pool) { Write(Make(pool, 10) - 1); }
void LongOverrun(Mgr& pool) { Write(Make(pool, 5000) + 5000); }

void UseAfterFree(Mgr& pool) {
  Make(pool, 10); // so that the bucket stays
  char* const p = Make(pool, 10);
  pool.Free(p);
  Write(p);
}

void UseAfterClear(Mgr& pool) {
  char* const p = Make(pool, 10);
  pool.Clear();
  Write(p);
}

// The pool stands at the end, and with it the records that nobody leads to any more: one in a
// bucket, one in a block of its own. An empty bucket that is kept is no leak, nor what is held.
void Leak(Mgr&) {
  VOK::MemPool::ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(true);
  static Mgr& standing = *new Mgr("standing");
  static char* const held = Make(standing, 11);
  standing.Free(Make(standing, 100));
  standing.Free(Make(standing, 200));
  Make(standing, 10);
  Make(standing, 5000);
  Write(held);
}

void FreeTwice(Mgr& pool) {
  Make(pool, 10);
  char* const p = Make(pool, 10);
  std::cout << pool.Free(p) << pool.Free(p) << pool.Contains(p) << pool.GetSize(p) << '\n';
}

// With pooling off, a second Free is the heap's to find.
void FreeTwiceUnpooled(Mgr&) {
  VOK::MemPool::ZOR_VOK_MEMPOOL_ON(false);
  Mgr heap("heap");
  char* const p = Make(heap, 10);
  heap.Free(p);
  heap.Free(p);
}

// All that is allowed, under all eyes.
void Nothing(Mgr& pool) {
  char* const p = Make(pool, 13);
  char* const large = Make(pool, 5000);
  pool.Dbg();
  pool.DbgDetailed();
  std::cout << pool.Contains(p) << pool.GetSize(large) << pool.Free(p) << pool.Free(large);
  Make(pool, 996);
  pool.Clear();
  Make(pool, 8);
  Mgr heap("heap");
}

struct Fault {
  const char* name;
  void (*make)(Mgr&);
};

const Fault faults[] = {{"overrun", Overrun},
                        {"underrun", Underrun},
                        {"long-overrun", LongOverrun},
                        {"use-after-free", UseAfterFree},
                        {"use-after-clear", UseAfterClear},
                        {"leak", Leak},
                        {"free-twice", FreeTwice},
                        {"free-twice-unpooled", FreeTwiceUnpooled},
                        {"nothing", Nothing}};

// Leaves nothing of what stood on the stack below the caller.
__attribute__((noinline)) void OverwriteStack() {
  volatile char bytes[1 << 14];
  for (volatile char& byte : bytes)
    byte = '#';
}

} // namespace

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  VOK::MemPool::ZOR_VOK_MEMPOOL_ON(true);
  for (const Fault& fault : faults) {
    if (fault.name != std::string(argv[1])) continue;
    Mgr pool("faulty");
    fault.make(pool);
    OverwriteStack();
    return 0;
  }
  return 2;
}
