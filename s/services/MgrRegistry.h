// The process-wide ordered map from a pool's name to the pool. It owns no pool. It is on no
// path of a request: only the construction, destruction and listing of pools touch it.
// Test: tests/registry_test.cpp.
#ifndef VOK_MEMPOOL_MGRREGISTRY_H
#define VOK_MEMPOOL_MGRREGISTRY_H

#include <functional>
#include <map>
#include <string>
#include <string_view>

namespace VOK::MemPool {

class Mgr;
struct BucketMgr;

namespace MgrRegistry {

using Map = std::map<std::string, BucketMgr*, std::less<>>;

/// Constructs the map, empty. Called once, before anything else of the library.
void Begin();

/// Releases all entries and leaves an empty map that still works, since a Mgr can outlive it.
void End() noexcept;

/// All pools by ascending name.
const Map& Entries();

/// The pool of that name, null if there is none.
BucketMgr* Find(std::string_view name);

/// Enters a pool. REQUIRES: the name is not in use.
void Enter(const std::string& name, BucketMgr* pool);

/// Removes the entry of that name, if there is one.
void Remove(const std::string& name) noexcept;

/// The handle of a pool. The engine, which knows a pool's inside, defines it.
Mgr* HandleOf(const BucketMgr* pool);

/// A name for a pool that was given none. A number once given never comes again.
std::string NextAutomaticName();

} // namespace MgrRegistry

} // namespace VOK::MemPool

#endif
