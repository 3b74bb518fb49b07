#include "trace/Replay.h"

#include "common/Tool.h"

#include <fmt/format.h>
#include <iostream>
#include <utility>

namespace VOK::MemPool::Tools {

Replay::Replay(PoolNames names_) : names(std::move(names_)) {
  ZOR_VOK_MEMPOOL_TRACE(false); // the program reads a trace and writes none
}

void Replay::Take(const TraceEvent& event, const TraceLedger::Verdict& verdict) {
  if (verdict.cleared != 0) PoolOf(verdict.cleared).Clear();
  switch (event.letter) {
  case 'c':
    Construct(event.pool);
    break;
  case 'd':
    pools.erase(event.pool);
    break;
  case 'a':
    blocks[event.data] = PoolOf(event.pool).Alloc(event.size);
    break;
  default:
    if (verdict.outcome == TraceLedger::Outcome::Done)
      PoolOf(event.pool).Free(blocks.at(event.data));
    if (verdict.outcome != TraceLedger::Outcome::Refused) blocks.erase(event.data);
    break;
  }
}

void Replay::Print(bool detailed) const {
  detailed ? DbgDetailed() : Dbg();
  if (!std::cout.flush()) throw Failure("standard output: can't be written");
}

Mgr& Replay::PoolOf(std::uint64_t addr) {
  if (!pools.contains(addr)) Construct(addr);
  return *pools.at(addr);
}

void Replay::Construct(std::uint64_t addr) {
  pools.erase(addr);
  const std::string name = NameOf(names, {0, addr});
  if (GetMgr(name.c_str()) != nullptr)
    throw Failure(fmt::format("two live pools have the name {}", OneLine(name)));
  pools[addr] = std::make_unique<Mgr>(name.c_str());
}

} // namespace VOK::MemPool::Tools
