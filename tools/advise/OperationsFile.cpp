#include "advise/OperationsFile.h"

#include "common/Files.h"

#include <MemPool>
#include <algorithm>

namespace VOK::MemPool::Tools {

namespace {

/// A shorter row of releases isn't worth a Reset, which visits every record.
constexpr std::size_t leastTogether = 64;

} // namespace

Part Part::Around(std::uint64_t peak, std::uint64_t events, std::uint64_t most) {
  if (events <= most) return {};
  const std::uint64_t before = most / 4 * 3;
  const std::uint64_t first = std::min(peak - std::min(peak, before), events - most);
  return {first, first + most};
}

OperationsFile::OperationsFile(const Part& part_, bool isPlain) : part(part_) {
  header.aligned = isPlain ? 0 : ~std::uint64_t(0);
}

void OperationsFile::Take(const RecordedEvent& event, std::uint8_t group) {
  if (numEvents == part.first) Start();
  if (numEvents++ >= part.last) return;
  Block* const old = blocks.Find(event.kind == Entry::Realloc ? event.old : event.block);
  if (!event.IsRequest() || event.size > maxRequest) {
    if (old == nullptr) return; // a block from before the recording, or one that was left out
    PutFree(*old);
    return blocks.Remove(*old);
  }
  Block block{
      .data = event.block, .size = event.size, .group = group, .alignmentLog = event.alignmentLog};
  const bool isResized = event.kind == Entry::Realloc && old != nullptr;
  if (isResized) {
    block.group = old->group;
    block.slot = old->slot;
    live -= old->size;
    blocks.Remove(*old);
  } else if (isStarted) {
    block.slot = TakeSlot();
  }
  if (isStarted)
    Put(block, isResized                     ? Action::Resize
               : event.kind == Entry::Calloc ? Action::AllocZero
                                             : Action::Alloc);
  blocks.FindOrAdd(block.data) = block;
}

/// Makes what is live when the part begins.
void OperationsFile::Start() {
  isStarted = true;
  live = 0;
  std::vector<std::uint64_t> numbers;
  for (const Block& block : blocks.GetPlaces())
    if (block.IsUsed()) numbers.push_back(block.data);
  std::ranges::sort(numbers);
  for (const std::uint64_t number : numbers) {
    Block& block = *blocks.Find(number);
    block.slot = TakeSlot();
    Put(block, Action::Alloc);
  }
  header.first = operations.size();
  peak = 0;
}

void OperationsFile::Put(const Block& block, Action action) {
  Run& run = runs[block.group];
  run.frees.clear();
  if (action != Action::Resize) ++run.live;
  if (block.size == 0 || block.size % 8 != 0) header.aligned &= ~(std::uint64_t(1) << block.group);
  live += block.size;
  if (live > peak) {
    peak = live;
    header.peak = operations.size();
  }
  operations.push_back({block.slot, static_cast<std::uint32_t>(block.size), action, block.group,
                        block.alignmentLog, 0});
}

void OperationsFile::PutFree(const Block& block) {
  if (!isStarted) return;
  live -= block.size;
  Run& run = runs[block.group];
  if (block.group != 0) run.frees.push_back(operations.size());
  operations.push_back({block.slot, 0, Action::Free, block.group, 0, 0});
  freeSlots.push_back(block.slot);
  if (--run.live > 0 || run.frees.size() < leastTogether) return;
  for (const std::size_t i : run.frees)
    operations[i].action = Action::FreeWithAll;
  run.frees.clear();
  operations.push_back({0, 0, Action::Reset, block.group, 0, 0});
}

std::uint32_t OperationsFile::TakeSlot() {
  if (freeSlots.empty()) return header.slots++;
  const std::uint32_t slot = freeSlots.back();
  freeSlots.pop_back();
  return slot;
}

void OperationsFile::Write() {
  header.count = operations.size();
  header.groups = mostGroups;
  std::string text(reinterpret_cast<const char*>(&header), sizeof header);
  text.append(reinterpret_cast<const char*>(operations.data()),
              operations.size() * sizeof(Operation));
  WriteFile(GetPath(), text);
}

} // namespace VOK::MemPool::Tools
