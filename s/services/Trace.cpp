// The four trace lines.
// Test: tests/trace_test.cpp.
#include "services/Trace.h"

#include "services/Output.h"

#include <charconv>
#include <ostream>

namespace VOK::MemPool {

BarePtrText::BarePtrText(const void* p) {
  const auto address = reinterpret_cast<std::uintptr_t>(p);
  *std::to_chars(text, text + sizeof text - 1, address, 16).ptr = '\0';
}

namespace Trace {

namespace {

std::ostream& Begin(OutputLine& line, const char* letter, const BucketMgr* pool) {
  return line.Stream() << "zvpt:" << letter << BarePtrText(pool).text;
}

} // namespace

void Constructed(const BucketMgr* pool) {
  OutputLine line;
  Begin(line, "c:", pool) << std::endl;
}

void Destroyed(const BucketMgr* pool) {
  OutputLine line;
  Begin(line, "d:", pool) << std::endl;
}

void Allocated(const BucketMgr* pool, const void* p, std::uint32_t size) {
  OutputLine line;
  Begin(line, "a:", pool) << ":" << BarePtrText(p).text << ":" << size << std::endl;
}

void Freed(const BucketMgr* pool, const void* p) {
  OutputLine line;
  Begin(line, "f:", pool) << ":" << BarePtrText(p).text << ":" << std::endl;
}

} // namespace Trace

} // namespace VOK::MemPool
