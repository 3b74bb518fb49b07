#include "advise/Statistics.h"

#include <algorithm>
#include <bit>
#include <fmt/format.h>
#include <functional>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t mostSizes = 64;    // that a site tells apart
constexpr std::size_t mostSamples = 400; // then every other one goes

/// Allocators, this library's adaptors, and what the C++ runtime puts between them and a program.
bool IsRuntime(const Location& where) {
  if (where.file.find("/include/c++/") != std::string::npos) return true;
  for (const char* const start : {"operator new", "libstdc++.so", "libc.so", "ld-linux"})
    if (where.function.starts_with(start)) return true;
  const std::string name = where.GetName();
  for (const char* const start : {"std::", "__gnu_cxx::", "VOK::MemPool::"})
    if (name.starts_with(start)) return true;
  return name == "malloc" || name == "calloc" || name == "realloc" || name == "strdup" ||
         name == "__strdup";
}

} // namespace

unsigned LogOf(std::uint64_t number) { return static_cast<unsigned>(std::bit_width(number)); }

Statistics::Statistics(Recording& recording_) : recording(recording_), symbols(recording_) {}

void Statistics::Read() {
  AddSample();
  for (RecordedEvent event; recording.Next(event);) {
    Take(event);
    if (recording.numEvents % interval != 0) continue;
    AddSample();
    ThinSamples();
  }
  if (recording.numEvents % interval != 0) AddSample();
  KeepPeak(); // which may be the end
}

LogCounts Statistics::GetLifetimes() const {
  LogCounts sums{};
  for (const LogCounts& counts : released)
    for (std::size_t i = 0; i < sums.size(); ++i)
      sums[i] += counts[i];
  return sums;
}

void Statistics::Take(const RecordedEvent& event) {
  time = event.time;
  threads = std::max(threads, event.thread + 1);
  switch (event.kind) {
  case Entry::Free:
    ++frees;
    return Remove(event.block, event.thread);
  case Entry::FreeUnknown:
    ++unknownFrees;
    return;
  case Entry::Realloc:
    ++reallocs;
    Remove(event.old, event.thread);
    break;
  default:
    break;
  }
  Add(event);
}

void Statistics::Add(const RecordedEvent& event) {
  const std::uint32_t number = SiteOf(event.stack);
  Site& site = sites[number];
  blocks.FindOrAdd(event.block) = {.data = event.block,
                                   .size = event.size,
                                   .request = requests,
                                   .site = number,
                                   .thread = static_cast<std::uint16_t>(event.thread)};
  ++requests;
  bytes += event.size;
  ++sizes[LogOf(event.size)];
  ++live;
  liveBytes += event.size;

  ++requestsOfStack[event.stack];
  ++site.requests;
  site.run = 0;
  site.bytes += event.size;
  site.reallocs += event.kind == Entry::Realloc ? 1 : 0;
  site.aligned += event.alignmentLog > 4 ? 1 : 0;
  site.maxSize = std::max(site.maxSize, event.size);
  if (site.sizes.size() < mostSizes || site.sizes.contains(event.size))
    ++site.sizes[event.size];
  else
    ++site.otherSizes;
  ++site.live;
  site.liveBytes += event.size;
  site.peakBytes = std::max(site.peakBytes, site.liveBytes);
  if (liveBytes > peakBytes) {
    peakBytes = liveBytes;
    peakEvent = recording.numEvents;
    isPeakKept = false;
  }
}

/// Each site's share of the peak is copied once the peak is over, at the first release after it.
void Statistics::KeepPeak() {
  if (std::exchange(isPeakKept, true)) return;
  for (Site& site : sites)
    site.bytesAtPeak = site.liveBytes;
}

void Statistics::Remove(std::uint64_t number, std::uint32_t thread) {
  LiveBlock* const block = blocks.Find(number);
  if (block == nullptr) return; // a recording with lost events
  KeepPeak();
  Site& site = sites[block->site];
  const unsigned lifetime = LogOf(requests - block->request - 1);
  ++released[LogOf(block->size)][lifetime];
  --live;
  liveBytes -= block->size;
  ++site.frees;
  ++site.lifetimes[lifetime];
  ++site.run;
  --site.live;
  site.liveBytes -= block->size;
  site.freedElsewhere += block->thread != thread ? 1 : 0;
  if (site.live == 0) site.freedTogether += std::exchange(site.run, 0);
  blocks.Remove(*block);
}

/// The site of a stack, and that stack's part of the site's callers.
std::uint32_t Statistics::SiteOf(std::uint32_t stack) {
  constexpr std::uint32_t unknown = ~std::uint32_t(0);
  if (stack >= siteOfStack.size()) siteOfStack.resize(stack + 1, unknown);
  std::uint32_t& number = siteOfStack[stack];
  if (number != unknown) return number;
  const std::vector<Location> all = symbols.Resolve(recording.stacks[stack]);
  auto where = std::ranges::find_if_not(all, IsRuntime);
  if (where == all.end() && !all.empty()) where = all.end() - 1;
  const Location place = where != all.end() ? *where : Location{.function = "unknown", .file = {}};
  const auto [entry, isNew] =
      siteByText.try_emplace(place.GetText(), static_cast<std::uint32_t>(sites.size()));
  if (isNew) {
    sites.emplace_back();
    sites.back().where = place;
    for (auto inner = all.begin(); inner != where; ++inner)
      sites.back().through.push_back(inner->GetName());
  }
  number = entry->second;
  std::string& callers = callersOfStack[stack];
  for (std::size_t i = 0; i < 3 && where != all.end() && ++where != all.end(); ++i)
    callers += (callers.empty() ? "" : " < ") + where->GetName();
  return number;
}

std::vector<std::pair<std::string, std::uint64_t>>
Statistics::GetCallers(std::uint32_t site) const {
  std::map<std::string, std::uint64_t> counts;
  for (const auto& [stack, count] : requestsOfStack)
    if (siteOfStack[stack] == site) counts[callersOfStack.at(stack)] += count;
  std::vector<std::pair<std::string, std::uint64_t>> sorted(counts.begin(), counts.end());
  std::ranges::stable_sort(sorted, std::greater<>(), [](const auto& one) { return one.second; });
  return sorted;
}

void Statistics::AddSample() {
  Sample sample{.event = recording.numEvents, .time = time, .liveBytes = {}};
  for (const Site& site : sites)
    sample.liveBytes.push_back(site.liveBytes);
  samples.push_back(std::move(sample));
}

void Statistics::ThinSamples() {
  if (samples.size() < mostSamples) return;
  interval *= 2;
  std::erase_if(samples, [&](const Sample& one) { return one.event % interval != 0; });
}

} // namespace VOK::MemPool::Tools
