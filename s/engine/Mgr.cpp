// The public handle: a pool's life, its name, and the one limit on a request's size.
// Test: tests/registry_test.cpp, tests/process_test.py.
#include "MemPool"

#include "base/KeepStores.h"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "engine/Checks.h"
#include "engine/FastPath.h"
#include "engine/Invariants.h"
#include "services/Messages.h"
#include "services/MgrRegistry.h"

#include <cstdint>
#include <memory>
#include <string>

namespace VOK::MemPool {

namespace {

[[noreturn]] VOK_NOINLINE void StopTooLarge(std::uint64_t size) {
  Messages::Error({"Cannot allocate ", size, " bytes, ", "the maximum is ", maxRequest});
}

[[noreturn]] VOK_NOINLINE void StopDuplicate(const std::string& name) {
  Messages::Error({"Duplicate Vok_MemPool::Mgr name encountered '", name.c_str(), "'"});
}

} // namespace

Mgr* MgrRegistry::HandleOf(const BucketMgr* pool) { return pool->mgr; }

Mgr::Mgr() : Mgr(nullptr) {}

// The name is looked up first, so that a pool that can't be entered isn't constructed; another
// thread may enter one of that name meanwhile.
Mgr::Mgr(const char* name) : bucketMgr(nullptr) {
  const std::string text = name != nullptr ? name : MgrRegistry::NextAutomaticName();
  if (MgrRegistry::Contains(text)) StopDuplicate(text);
  auto block = std::make_unique<PoolBlock>(this, text, Options());
  bucketMgr = &block->pool;
  if (!MgrRegistry::Enter(text, bucketMgr)) StopDuplicate(text);
  static_cast<void>(block.release());
}

Mgr::~Mgr() {
  if (bucketMgr == nullptr) return;
  MgrRegistry::Remove(bucketMgr->name);
  delete &PoolBlock::Of(*bucketMgr);
  bucketMgr = nullptr;
  KeepStores(this);
}

// Private, so that no caller copies a handle.
Mgr::Mgr(const Mgr&) {}

Mgr& Mgr::operator=(const Mgr& other) {
  bucketMgr = other.bucketMgr;
  return *this;
}

void* Mgr::Alloc(unsigned size) {
  if (size > maxRequest) [[unlikely]]
    StopTooLarge(size);
  const Checked checked(bucketMgr);
  return bucketMgr->Alloc(size);
}

bool Mgr::Free(void* p) {
  const Checked checked(bucketMgr);
  return bucketMgr->Free(p);
}

void Mgr::Clear() {
  const Checked checked(bucketMgr);
  if (Checks* const checks = ChecksOf(*bucketMgr)) return checks->Clear();
  bucketMgr->Clear();
}

bool Mgr::Reset() {
  const Checked checked(bucketMgr);
  if (Checks* const checks = ChecksOf(*bucketMgr)) return checks->Reset();
  return bucketMgr->Reset();
}

void* Mgr::AllocWide(unsigned long long size) { StopTooLarge(size); }

unsigned Mgr::GetSize(const void* p) const { return bucketMgr->GetSize(p); }

bool Mgr::Contains(const void* p) const { return bucketMgr->Contains(p); }

bool Mgr::CollectGarbage() { return false; }

BucketMgr* Mgr::GetBucketMgr() const { return bucketMgr; }

const char* Mgr::GetName() const { return bucketMgr->name.c_str(); }

bool Mgr::IsEnabled() const { return bucketMgr->enabled; }

bool Mgr::IsObserved() const { return Observers::Watching() || ChecksOf(*bucketMgr) != nullptr; }

unsigned Mgr::GetNumFindings() const {
  const Checks* const checks = ChecksOf(*bucketMgr);
  return checks != nullptr ? checks->GetNumFindings() : 0;
}

} // namespace VOK::MemPool
