// The call stacks of a recorded process: each gets a number, and is put into the ring once.
#ifndef VOK_MEMPOOL_TOOLS_RECORD_STACK_H
#define VOK_MEMPOOL_TOOLS_RECORD_STACK_H

#include <cstddef>
#include <cstdint>

namespace VOK::MemPool::Record::Stack {

/// Finds the unwinder.
void Prepare();

/// The number of the stack that ends in `frame`, a frame with a frame pointer: its function's
/// return address is the innermost entry. 0 if no number is left.
std::uint32_t GetNumber(void* const* frame);

/// After modules were unloaded: an address may mean something else from now on.
void Forget();

/// In the child of a fork: its ring has no stacks yet.
void Restart();

} // namespace VOK::MemPool::Record::Stack

#endif
