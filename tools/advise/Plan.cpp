#include "advise/Plan.h"

#include <algorithm>
#include <fmt/format.h>
#include <functional>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::uint64_t mostRecordSize = 4000; // above it a block of the heap serves as well

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

} // namespace VOK::MemPool::Tools
