// The four trace lines.
// Test: tests/output_test.cpp.
#include "services/Trace.h"

#include "base/PointerText.h"
#include "services/OutputLine.h"

namespace VOK::MemPool::Trace {

namespace {

OutputLine& Begin(OutputLine&& line, const char* letter, const BucketMgr* pool) {
  return line << "zvpt:" << letter << BarePtrText(pool).text;
}

} // namespace

void Constructed(const BucketMgr* pool) { Begin(OutputLine(), "c:", pool).End(); }

void Destroyed(const BucketMgr* pool) { Begin(OutputLine(), "d:", pool).End(); }

void Allocated(const BucketMgr* pool, const void* p, std::uint32_t size) {
  (Begin(OutputLine(), "a:", pool) << ":" << BarePtrText(p).text << ":" << size).End();
}

void Freed(const BucketMgr* pool, const void* p) {
  (Begin(OutputLine(), "f:", pool) << ":" << BarePtrText(p).text << ":").End();
}

} // namespace VOK::MemPool::Trace
