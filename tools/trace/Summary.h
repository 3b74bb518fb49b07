// The result of reading a trace, as a text and as JSON.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_SUMMARY_H
#define VOK_MEMPOOL_TOOLS_TRACE_SUMMARY_H

#include "trace/Ledger.h"

#include <functional>
#include <map>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

/// The names of pools: those that the user gives to addresses, and those in reports of the text.
struct PoolNames {
  std::map<std::uint64_t, std::string> given;
  std::map<PoolId, std::string> reported;

  /// A given name comes first. Null if the pool has none.
  const std::string* Find(const PoolId& pool) const;
};

/// A pool's address as the trace shows it.
std::string BareAddress(std::uint64_t addr);

/// A pool's name, or its address if it has none.
std::string NameOf(const PoolNames& names, const PoolId& pool);

/// `numLines` is the number of all lines of the text.
std::string SummariseTrace(const TraceLedger& ledger, std::uint64_t numLines,
                           const PoolNames& names);

/// Writes a JSON document in pieces. docs/tools.md documents the form.
void WriteTraceJson(const TraceLedger& ledger, std::uint64_t numLines, const PoolNames& names,
                    const std::function<void(std::string_view)>& write);

} // namespace VOK::MemPool::Tools

#endif
