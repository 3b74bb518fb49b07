// The invariants of a bucket, a group and a pool, walked. Built for the tests and the checked
// configuration alone.
// Test: tests/model_test.cpp.
#ifndef VOK_MEMPOOL_INVARIANTS_H
#define VOK_MEMPOOL_INVARIANTS_H

#include <cassert>

namespace VOK::MemPool {

struct Bucket;
struct BucketMgr;
struct Group;

/// Whether all that the struct's comment says of it holds. Visits every record and every link; the
/// one for a group asks its buckets too, the one for a pool its groups. They change nothing.
bool IsValid(const Bucket& bucket);
bool IsValid(const Group& group);
bool IsValid(const BucketMgr& pool);

/// Begins an operation on a pool; in the checked configuration it walks the pool at the operation's
/// end, also when an exception leaves it, and elsewhere it does nothing.
class Checked {
#ifdef VOK_MEMPOOL_CHECKED
public:
  explicit Checked(const BucketMgr* pool_) : pool(pool_) {}
  ~Checked() { assert(IsValid(*pool)); }
  Checked(const Checked&) = delete;
  Checked& operator=(const Checked&) = delete;

private:
  const BucketMgr* pool;
#else
public:
  explicit Checked(const BucketMgr*) {}
#endif
};

} // namespace VOK::MemPool

#endif
