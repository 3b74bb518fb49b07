// A class with a pool of its own, and what a module that hides all else lets others reach.
#ifndef VOK_MEMPOOL_PARTS_MODULE_H
#define VOK_MEMPOOL_PARTS_MODULE_H

#include <MemPoolAllocator>

struct Rivets {
  static constexpr const char* name = "rivets";
};

struct Rivet final : VOK::MemPool::Pooled<Rivet, Rivets> {
  double length = 1;
};

struct PartsModule {
  Rivet* (*make)();
  void (*destroy)(Rivet* rivet);
  VOK::MemPool::Mgr& (*pool)();
};

// Where a module is told what to export, it exports all if it is told nothing.
#ifndef _WIN32
__attribute__((visibility("default")))
#endif
extern const PartsModule partsModule;

#endif
