// The operations of an ExtRec; none is on the fast path.
// Test: tests/bucketmgr_test.cpp.
#include "engine/ExtRec.h"

#include "base/KeepStores.h"

#include <new>

namespace VOK::MemPool {

ExtRec* ExtRec::Create(std::uint32_t size) {
  void* const block = ::operator new[](sizeof(ExtRec) + size);
  return new (block) ExtRec{nullptr, nullptr, size, 0xAA, 0xBB, RecType::Ext, 0xCC};
}

void ExtRec::Destroy(ExtRec* e) noexcept { ::operator delete[](e); }

// A pointer that no bucket and no list knows may start its heap block, so what lies before it
// is not ours: the address sanitizer must not check these reads. They go byte by byte, since it
// would check memcpy, and stop at the first that differs.
__attribute__((no_sanitize_address)) ExtRec* ExtRec::FromData(const void* p) {
  if (p == nullptr) return nullptr;
  const auto* const end = static_cast<const std::uint8_t*>(p);
  if (end[-4] != 0xAA || end[-3] != 0xBB || RecType{end[-2]} != RecType::Ext || end[-1] != 0xCC)
    return nullptr;
  if ((end[-8] | end[-7] | end[-6] | end[-5]) == 0) return nullptr;
  return reinterpret_cast<ExtRec*>(reinterpret_cast<std::uintptr_t>(p) - sizeof(ExtRec));
}

bool ExtRec::FitsList(const ExtRec* head) const {
  if (head == nullptr) return false;
  if (prev == nullptr ? head != this : prev->next != this) return false;
  return next == nullptr || next->prev == this;
}

void ExtRec::Link(ExtRec*& head, std::uint32_t& count) {
  ++count;
  next = head;
  if (head != nullptr) head->prev = this;
  head = this;
}

void ExtRec::Unlink(ExtRec*& head, std::uint32_t& count) {
  --count;
  (prev != nullptr ? prev->next : head) = next;
  if (next != nullptr) next->prev = prev;
}

void ExtRec::Scrub() {
  *this = {};
  KeepStores(this);
}

} // namespace VOK::MemPool
