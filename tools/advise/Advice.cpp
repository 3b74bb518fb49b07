#include "advise/Advice.h"

#include <algorithm>
#include <cmath>
#include <fmt/format.h>
#include <functional>
#include <limits>
#include <numeric>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t mostShown = 20; // call sites
constexpr std::size_t mostPooled = 6; // sites that are tried alone: each costs replays

bool Passes(const Site& site, std::string_view function) {
  return std::ranges::any_of(site.through, [&](const std::string& name) {
    return name.find(function) != std::string::npos;
  });
}

/// How the requests of a site would come from a pool.
std::string ChangeOf(const Site& site) {
  const std::string at = site.where.GetText();
  if (Passes(site, "make_unique"))
    return fmt::format("{}: MakeUnique(pool, ...) in place of std::make_unique", at);
  if (Passes(site, "allocator") || Passes(site, "std::"))
    return fmt::format("{}: give the container an Allocator<T>(pool)", at);
  if (Passes(site, "operator new"))
    return fmt::format("{}: derive the class from Pooled<Tag>, or give its container an "
                       "Allocator<T>(pool)",
                       at);
  return fmt::format("{}: pool.Alloc(size) and pool.Free(pointer) in place of malloc and free", at);
}

/// A variant under one more change of its settings, each in turn.
std::vector<Variant> ChangesOf(const Variant& base) {
  std::vector<Variant> variants;
  const auto add = [&](auto change) {
    Variant variant{
        .name = {}, .pooled = base.pooled, .settings = base.settings, .resets = base.resets};
    change(variant.settings, variant.resets);
    variant.name = variant.GetName();
    variants.push_back(std::move(variant));
  };
  add([](PoolSettings& one, bool&) { one.keepEmptyBuckets = true; });
  for (const unsigned bytes : {16000u, 65535u})
    add([bytes](PoolSettings& one, bool&) { one.bucketSize = bytes; });
  if (base.settings.maxRecordSize == 0)
    add([](PoolSettings& one, bool&) {
      one.bucketSize = 1004;
      one.maxRecordSize = 240;
    });
  add([](PoolSettings& one, bool&) { one.minRecordSize = 64; });
  add([](PoolSettings& one, bool&) {
    one.dataAlignment = 16;
    one.maxRecordSize = one.maxRecordSize / 16 * 16 + (one.maxRecordSize > 0 ? 16 : 0);
  });
  add([](PoolSettings&, bool& resets) { resets = true; });
  return variants;
}

std::vector<Outcome> OutcomesOf(const std::vector<Variant>& variants) {
  std::vector<Outcome> outcomes;
  outcomes.reserve(variants.size());
  for (const Variant& variant : variants)
    outcomes.push_back({variant, DifferenceOf(variant, variants.front())});
  return outcomes;
}

} // namespace

Advice::Advice(const AdviceRequest& request_)
    : request(request_), recording(OpenRecording(request.file, request.name)),
      statistics(recording) {
  statistics.Read();
  JudgeSites();
  if (request.measures) Replay();
}

Interval Advice::GetForecast() const {
  constexpr double modelError = 0.25;
  const Interval& measured = best->difference;
  const double more = modelError * std::abs(measured.mean);
  return {measured.mean, measured.low - more, measured.high + more};
}

std::vector<std::string> Advice::GetChanges() const {
  std::vector<std::string> changes;
  for (const SiteAdvice& one : sites)
    if (one.isChosen) changes.push_back(one.change);
  if (best->variant.resets)
    changes.emplace_back(
        "Where all records of a pool die together: pool.Reset() in place of each Free");
  return changes;
}

void Advice::JudgeSites() {
  std::vector<std::uint32_t> order(statistics.sites.size());
  std::iota(order.begin(), order.end(), 0u);
  std::ranges::stable_sort(order, std::greater<>(),
                           [&](std::uint32_t i) { return statistics.sites[i].requests; });
  order.resize(std::min(order.size(), mostShown));
  for (const std::uint32_t i : order)
    sites.push_back({.site = i,
                     .verdict = Judge(statistics.sites[i], statistics),
                     .change = ChangeOf(statistics.sites[i]),
                     .seconds = std::nullopt});
}

/// Four series of rounds: each site alone; the grouping under each change of a setting, beside
/// other allocators; each further change of the best of these; and the best again, since the best
/// of many is partly luck.
void Advice::Replay() {
  const std::vector<std::uint32_t> candidates = FindCandidates(statistics, mostPooled);
  if (candidates.empty()) return;
  part = Part::Around(statistics.peakEvent, recording.numEvents, request.mostEvents);
  OperationsFile operations(part);
  WriteOperations(operations, candidates);
  const std::uint64_t pooled = ChooseGrouping(operations.GetPath());
  const Variant plain = PlainPools(pooled);
  std::vector<Variant> variants = ChangesOf(plain);
  variants.insert(variants.begin(), plain);
  for (const auto& [name, path] : FindAllocators())
    variants.push_back({.name = name, .allocator = path});
  Try(operations.GetPath(), std::move(variants));
  variants = ChangesOf(FindBest().variant);
  std::erase_if(variants, [&](const Variant& variant) { return WasTried(variant.name); });
  Try(operations.GetPath(), std::move(variants));

  std::vector<Variant> last{{.name = "heap"}, FindBest().variant};
  last.back().seconds.clear();
  Measure(operations.GetPath(), last, request.rounds);
  heap = last.front();
  best = Outcome{last.back(), DifferenceOf(last.back(), heap)};
}

/// Each of the sites is a group, from 1 on.
void Advice::WriteOperations(OperationsFile& operations,
                             const std::vector<std::uint32_t>& pooled) const {
  std::vector<std::uint8_t> groupOf(statistics.sites.size());
  for (std::size_t i = 0; i < pooled.size(); ++i)
    groupOf[pooled[i]] = static_cast<std::uint8_t>(i + 1);
  Recording again = OpenRecording(request.file, request.name);
  for (RecordedEvent event; again.Next(event);)
    operations.Take(event,
                    event.IsRequest() ? groupOf[statistics.GetSite(event.stack)] : std::uint8_t(0));
  operations.Write();
}

/// Tries each candidate alone. The grouping has those that save time in the mean, or all if none
/// does.
std::uint64_t Advice::ChooseGrouping(const std::string& operations) {
  std::vector<Variant> variants{{.name = "heap"}};
  std::vector<SiteAdvice*> tried;
  for (const std::uint32_t site : FindCandidates(statistics, mostPooled)) {
    variants.push_back({.name = statistics.sites[site].where.GetText(),
                        .pooled = std::uint64_t(1) << variants.size()});
    tried.push_back(&*std::ranges::find(sites, site, &SiteAdvice::site));
  }
  Measure(operations, variants, request.rounds);
  std::uint64_t all = 0;
  std::uint64_t chosen = 0;
  for (std::size_t i = 0; i < tried.size(); ++i) {
    const Variant& variant = variants[i + 1];
    tried[i]->seconds = DifferenceOf(variant, variants.front());
    all |= variant.pooled;
    if (tried[i]->seconds->mean < 0) chosen |= variant.pooled;
  }
  if (chosen == 0) chosen = all;
  for (std::size_t i = 0; i < tried.size(); ++i)
    tried[i]->isChosen = (chosen & variants[i + 1].pooled) != 0;
  return chosen;
}

/// Pools as set, but for larger requests of the sites, which would be blocks of their own: as far
/// as a bucket has room for such a record.
Variant Advice::PlainPools(std::uint64_t pooled) const {
  Variant plain{.name = "pools", .pooled = pooled};
  constexpr std::uint64_t defaultRecord = 996;
  constexpr std::uint64_t alignment = 4;
  for (const SiteAdvice& one : sites)
    if (const std::uint64_t size = statistics.sites[one.site].maxSize;
        one.isChosen && size + 8 > defaultRecord && size < 3968)
      plain.settings.maxRecordSize = std::max(
          plain.settings.maxRecordSize, static_cast<unsigned>((size + 8 + alignment) / 4 * 4));
  return plain;
}

/// Measures these beside the heap.
void Advice::Try(const std::string& operations, std::vector<Variant> variants) {
  variants.insert(variants.begin(), Variant{.name = "heap"});
  Measure(operations, variants, request.rounds);
  std::vector<Outcome> found = OutcomesOf(variants);
  if (!outcomes.empty()) found.erase(found.begin()); // the heap has its row
  outcomes.insert(outcomes.end(), found.begin(), found.end());
}

bool Advice::WasTried(const std::string& name) const {
  return std::ranges::any_of(outcomes,
                             [&](const Outcome& outcome) { return outcome.variant.name == name; });
}

/// The fastest with pools, or what was tried before it and isn't slower beyond its interval: fewer
/// settings come first.
const Outcome& Advice::FindBest() const {
  const auto secondsOf = [](const Outcome& outcome) {
    return outcome.variant.pooled != 0 ? outcome.difference.mean
                                       : std::numeric_limits<double>::infinity();
  };
  const Outcome& fastest = *std::ranges::min_element(outcomes, {}, secondsOf);
  return *std::ranges::find_if(outcomes, [&](const Outcome& outcome) {
    return secondsOf(outcome) <= fastest.difference.high;
  });
}

} // namespace VOK::MemPool::Tools
