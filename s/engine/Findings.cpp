// The count, the call and the line of a finding.
// Test: tests/checked_test.cpp, tests/process_test.py.
#include "base/PointerText.h"
#include "engine/BucketMgr.h"
#include "engine/Checks.h"
#include "services/Messages.h"

namespace VOK::MemPool {

namespace {

const char* TextOf(Finding::Kind kind) {
  switch (kind) {
  case Finding::Kind::SecondFree:
    return "second Free of ";
  case Finding::Kind::StrayFree:
    return "Free of ";
  case Finding::Kind::DamagedHeader:
    return "damaged header of ";
  case Finding::Kind::Overrun:
    return "write beyond the end of ";
  case Finding::Kind::WriteAfterFree:
    return "write after Free to ";
  case Finding::Kind::BrokenFreeList:
    return "broken free list at ";
  case Finding::Kind::StillInUse:
    break;
  }
  return "still in use at the end: ";
}

const char* TextOfUnknown(Finding::Kind kind) {
  if (kind == Finding::Kind::StrayFree) return ", no record of this pool";
  if (kind == Finding::Kind::DamagedHeader) return ", a bucket";
  return ", a record never allocated";
}

} // namespace

void Checks::Report(Finding::Kind kind, const void* address, const Record* record, bool writes) {
  const Finding finding{kind, address, record != nullptr ? record->size : 0,
                        record != nullptr ? record->number : 0};
  ++numFindings;
  if (atFinding != nullptr) atFinding(*pool.mgr, finding, context);
  if (!writes) return;
  const auto write = [this](Messages::Text text) {
    if (endsAtFinding) Messages::Error(text);
    Messages::Warning(text);
  };
  const char* const name = pool.name.c_str();
  const BarePtrText place(address);
  if (finding.number != 0)
    write({"Pool '", name, "': ", TextOf(kind), "0x", place.text, ", a record of ", finding.size,
           " bytes, request ", std::uint64_t{finding.number}});
  else
    write({"Pool '", name, "': ", TextOf(kind), "0x", place.text, TextOfUnknown(kind)});
}

} // namespace VOK::MemPool
