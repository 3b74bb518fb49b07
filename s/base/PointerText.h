// The text of a pointer.
// Test: tests/output_test.cpp.
#ifndef VOK_MEMPOOL_POINTERTEXT_H
#define VOK_MEMPOOL_POINTERTEXT_H

#include <charconv>
#include <cstdint>

namespace VOK::MemPool {

/// A pointer as the platform's stream writes it in the classic locale, without a leading "0x".
struct BarePtrText {
  char text[2 * sizeof(void*) + 1];

  explicit BarePtrText(const void* p) {
    const auto address = reinterpret_cast<std::uintptr_t>(p);
    *std::to_chars(text, text + sizeof text - 1, address, 16).ptr = '\0';
  }
};

} // namespace VOK::MemPool

#endif
