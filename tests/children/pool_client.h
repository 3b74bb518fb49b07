// What the host reaches in the client library, by one name.
#ifndef VOK_MEMPOOL_POOL_CLIENT_H
#define VOK_MEMPOOL_POOL_CLIENT_H

namespace VOK::MemPool {
class Mgr;
}

struct PoolClient {
  VOK::MemPool::Mgr* (*make)();           ///< makes a nameless pool that stands
  void (*report)(VOK::MemPool::Mgr* mgr); ///< tells what the library says of it, and uses it
  void (*destroy)(VOK::MemPool::Mgr* mgr);
  void (*stop)(VOK::MemPool::Mgr* mgr); ///< asks it for more than the limit
};

extern "C" const PoolClient poolClient;

#endif
