// The trace lines of all pools and the test of their switch. A line is reported after the fact or
// in a destructor, so it allocates nothing and throws nothing: OutputLine sees to both.
// Test: tests/output_test.cpp.
#ifndef VOK_MEMPOOL_TRACE_H
#define VOK_MEMPOOL_TRACE_H

#include "services/Observers.h"

#include <cstdint>

namespace VOK::MemPool {

struct BucketMgr;

namespace Trace {

inline bool IsOn() { return Observers::IsTracing(); }

void Constructed(const BucketMgr* pool);
void Destroyed(const BucketMgr* pool);
void Allocated(const BucketMgr* pool, const void* p, std::uint32_t size);
void Freed(const BucketMgr* pool, const void* p);

} // namespace Trace

} // namespace VOK::MemPool

#endif
