// The process-wide ordered map from a pool's name to the pool, under a lock. It owns no pool. It is
// on no path of a request: only the construction, destruction and listing of pools touch it.
// Test: tests/registry_test.cpp, tests/threads_test.cpp.
#ifndef VOK_MEMPOOL_MGRREGISTRY_H
#define VOK_MEMPOOL_MGRREGISTRY_H

#include "base/Attributes.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool {

class Mgr;
struct BucketMgr;

/// Any thread may call these at any time. The lock is held for no allocation and no release, since
/// a program's own heap and its new-handler may come back here; it is held during a fork.
namespace MgrRegistry {

/// A pool under its name. The entries are a list by ascending name, which another process follows
/// without knowledge of the map.
struct Entry {
  const char* name;
  BucketMgr* pool;
  Entry* next;
};

extern VOK_HIDDEN Entry* first; ///< null while there is no pool

/// Constructs the map, empty. Called once, before anything else of the library.
void Begin();

/// Releases all entries and leaves an empty map that still works, since a Mgr can outlive it.
void End() noexcept;

/// Whether a pool has that name. Another thread may enter one right after.
bool Contains(std::string_view name);

/// The handle of the pool of that name, null if there is none.
Mgr* Find(std::string_view name);

/// The number of pools.
unsigned Count();

/// The handles of all pools by ascending name.
std::vector<Mgr*> Handles();

/// Enters a pool; false, with nothing changed, if the name is in use.
bool Enter(const std::string& name, BucketMgr* pool);

/// Removes the entry of that name, if there is one.
void Remove(std::string_view name) noexcept;

/// The handle of a pool. The engine, which knows a pool's inside, defines it.
Mgr* HandleOf(const BucketMgr* pool);

/// A name for a pool that was given none. A number once given never comes again.
std::string NextAutomaticName();

} // namespace MgrRegistry

} // namespace VOK::MemPool

#endif
