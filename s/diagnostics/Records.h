// How a report reads the records of a bucket: by address, whatever the header says of them, and no
// byte at or after the end of the record area, so that a damaged header leads nowhere else.
// Test: tests/report_test.cpp.
#ifndef VOK_MEMPOOL_RECORDS_H
#define VOK_MEMPOOL_RECORDS_H

#include "diagnostics/ReportLayout.h"
#include "engine/Bucket.h"
#include "engine/Rec.h"

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool {

/// The type of a record that has no such byte within the area.
inline constexpr RecType noType{255};

/// The type of the record at `offset`, read again.
inline RecType TypeAt(const Bucket& bucket, std::uint32_t offset) {
  return offset + offsetof(Rec, type) < bucket.recsSize ? bucket.RecAt(offset)->type : noType;
}

/// Whether the header of a record at `offset` lies within the area. Offset 0, which ends a free
/// list, never does.
inline bool HoldsHeader(const Bucket& bucket, std::uint32_t offset) {
  return offset >= 2 && offset + recHeaderSize <= bucket.recsSize;
}

/// A type's name in all reports.
inline const char* TypeLabel(RecType type) {
  switch (type) {
  case RecType::Free:
    return TypeName::free;
  case RecType::Used:
    return TypeName::used;
  case RecType::Ext:
    return TypeName::ext;
  }
  return TypeName::unknown;
}

} // namespace VOK::MemPool

#endif
