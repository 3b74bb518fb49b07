#include "advise/Plan.h"

#include "common/Files.h"
#include "common/Programs.h"
#include "common/Tool.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fmt/format.h>
#include <functional>
#include <unistd.h>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::uint64_t mostRecordSize = 4000; // above it a block of the heap serves as well

/// A shorter row of releases isn't worth a Reset, which visits every record.
constexpr std::size_t leastTogether = 64;

double Share(std::uint64_t part, std::uint64_t whole) {
  return whole == 0 ? 0 : 100 * static_cast<double>(part) / static_cast<double>(whole);
}

/// Requests of more bytes than a record has.
std::uint64_t LargeRequests(const Site& site) {
  std::uint64_t large = site.maxSize > mostRecordSize ? site.otherSizes : 0;
  for (const auto& [size, count] : site.sizes)
    large += size > mostRecordSize ? count : 0;
  return large;
}

} // namespace

Verdict Judge(const Site& site, const Statistics& statistics) {
  if (Share(site.requests, statistics.requests) < 1)
    return {false, fmt::format("{:.2f}% of all requests: too few to matter",
                               Share(site.requests, statistics.requests))};
  if (const double large = Share(LargeRequests(site), site.requests); large > 5)
    return {false,
            fmt::format("{:.0f}% of its requests are above {} bytes", large, mostRecordSize)};
  if (const double resized = Share(site.reallocs, site.requests); resized > 1)
    return {false, fmt::format("{:.0f}% of its blocks come from realloc, which a pool doesn't have",
                               resized)};
  if (const double aligned = Share(site.aligned, site.requests); aligned > 1)
    return {false, fmt::format("{:.0f}% of its blocks are aligned to more than 16", aligned)};
  std::string reason = site.otherSizes == 0 && site.sizes.size() == 1
                           ? fmt::format("one size, {} bytes", site.sizes.begin()->first)
                           : fmt::format("{}{} sizes up to {} bytes", site.sizes.size(),
                                         site.otherSizes > 0 ? " and more" : "", site.maxSize);
  if (const double together = Share(site.freedTogether, site.frees); together >= 50)
    reason += fmt::format("; {:.0f}% are freed together, where Reset or Clear serves", together);
  if (const double elsewhere = Share(site.freedElsewhere, site.frees); elsewhere > 0.1)
    reason += fmt::format("; {:.0f}% are freed by another thread: MemPoolThreads", elsewhere);
  return {true, reason};
}

std::vector<std::uint32_t> FindCandidates(const Statistics& statistics, std::size_t most) {
  std::vector<std::uint32_t> found;
  for (std::uint32_t i = 0; i < statistics.sites.size(); ++i)
    if (Judge(statistics.sites[i], statistics).isCandidate) found.push_back(i);
  std::ranges::stable_sort(found, std::greater<>(),
                           [&](std::uint32_t i) { return statistics.sites[i].requests; });
  found.resize(std::min(found.size(), most));
  return found;
}

OperationsFile::OperationsFile(Recording& recording, const Statistics& statistics,
                               const std::vector<std::uint8_t>& groupOf, std::uint64_t mostEvents) {
  const std::uint64_t events = statistics.requests + statistics.frees + statistics.unknownFrees;
  isWhole = events <= mostEvents;
  if (!isWhole) {
    const std::uint64_t before = mostEvents / 4 * 3; // of the peak
    firstEvent = std::min(statistics.peakEvent - std::min(statistics.peakEvent, before),
                          events - mostEvents);
  }
  lastEvent = std::min(events, firstEvent + mostEvents);
  for (RecordedEvent event; recording.numEvents < lastEvent && recording.Next(event);) {
    if (recording.numEvents > firstEvent && !isStarted) Start();
    Take(event, statistics, groupOf);
  }
  ++firstEvent;
  Write();
}

OperationsFile::~OperationsFile() { unlink(path.c_str()); }

void OperationsFile::Take(const RecordedEvent& event, const Statistics& statistics,
                          const std::vector<std::uint8_t>& groupOf) {
  Used* const old = blocks.Find(event.kind == Entry::Realloc ? event.old : event.block);
  if (event.kind == Entry::FreeUnknown || (event.kind == Entry::Free && old == nullptr)) return;
  if (event.kind == Entry::Free) {
    PutFree(*old);
    return blocks.Remove(*old);
  }
  Used block{.data = event.block,
             .size = event.size,
             .group = groupOf[statistics.GetSite(event.stack)],
             .alignmentLog = event.alignmentLog,
             .isZero = event.kind == Entry::Calloc};
  const bool isResized = event.kind == Entry::Realloc && old != nullptr;
  if (isResized) {
    block.group = old->group; // a block stays where it was made
    block.slot = old->slot;
    live -= old->size;
    blocks.Remove(*old);
  } else if (isStarted) {
    block.slot = TakeSlot();
  }
  if (isStarted)
    Put(block,
        isResized      ? Action::Resize
        : block.isZero ? Action::AllocZero
                       : Action::Alloc,
        block.size);
  else
    live += block.size;
  blocks.FindOrAdd(block.data) = block;
}

/// Makes what is live when the part begins.
void OperationsFile::Start() {
  isStarted = true;
  live = 0;
  std::vector<std::uint64_t> numbers;
  for (const Used& block : blocks.GetPlaces())
    if (block.IsUsed()) numbers.push_back(block.data);
  std::ranges::sort(numbers);
  for (const std::uint64_t number : numbers) {
    Used& block = *blocks.Find(number);
    block.slot = TakeSlot();
    Put(block, Action::Alloc, block.size);
  }
  header.first = operations.size();
  peak = 0;
}

void OperationsFile::Put(const Used& block, Action action, std::uint64_t size) {
  if (size > ~std::uint32_t(0)) throw Failure("a block above 4 GiB can't be replayed");
  Run& run = runs[block.group];
  run.frees.clear();
  if (action != Action::Resize) ++run.live;
  live += size;
  if (live > peak) {
    peak = live;
    header.peak = operations.size();
  }
  operations.push_back(
      {block.slot, static_cast<std::uint32_t>(size), action, block.group, block.alignmentLog, 0});
}

void OperationsFile::PutFree(const Used& block) {
  live -= block.size;
  if (!isStarted) return;
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
  path = TemporaryName();
  const int file = mkstemp(path.data());
  if (file < 0) throw Failure(fmt::format("{}: can't be made: {}", path, std::strerror(errno)));
  close(file);
  header.count = operations.size();
  header.groups = mostGroups;
  std::string text(reinterpret_cast<const char*>(&header), sizeof header);
  text.append(reinterpret_cast<const char*>(operations.data()),
              operations.size() * sizeof(Operation));
  WriteFile(path, text);
  operations = {};
}

} // namespace VOK::MemPool::Tools
