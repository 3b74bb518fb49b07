// Stores to an object whose life or memory ends next. The compiler takes them for dead and drops
// them; a stale pointer to the object must find them done all the same.
// Test: tests/bucketmgr_test.cpp, tests/reentry_test.cpp.
#ifndef VOK_MEMPOOL_KEEPSTORES_H
#define VOK_MEMPOOL_KEEPSTORES_H

namespace VOK::MemPool {

/// Completes all stores to the object at `p`. It costs no instruction.
inline void KeepStores(const void* p) noexcept { __asm__ volatile("" : : "r"(p) : "memory"); }

} // namespace VOK::MemPool

#endif
