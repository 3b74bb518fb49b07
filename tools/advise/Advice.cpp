#include "advise/Advice.h"

#include <algorithm>
#include <cmath>
#include <fmt/format.h>
#include <functional>
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

std::vector<Outcome> OutcomesOf(const std::vector<Variant>& variants) {
  std::vector<Outcome> outcomes;
  for (const Variant& variant : variants)
    outcomes.push_back({variant, DifferenceOf(variant, variants.front())});
  return outcomes;
}

} // namespace

Advice::Advice(const AdviceRequest& request_)
    : request(request_), recording(OpenRecording(request.file)), statistics(recording) {
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

/// Three series of rounds: each site alone, the grouping under settings and beside other
/// allocators, and the best of these again, since the best of many is partly luck.
void Advice::Replay() {
  const std::vector<std::uint32_t> candidates = FindCandidates(statistics, mostPooled);
  if (candidates.empty()) return;
  part = Part::Around(statistics.peakEvent, recording.numEvents, request.mostEvents);
  OperationsFile operations(part);
  WriteOperations(operations, candidates);
  const std::uint64_t pooled = ChooseGrouping(operations.GetPath());
  std::vector<Variant> variants = VariantsOf(pooled);
  Measure(operations.GetPath(), variants, request.rounds);
  outcomes = OutcomesOf(variants);
  heap = variants.front();
  if (const Outcome* const found = FindBest(); found != nullptr) {
    std::vector<Variant> last{variants.front(), found->variant};
    for (Variant& variant : last)
      variant.seconds.clear();
    Measure(operations.GetPath(), last, request.rounds);
    heap = last.front();
    best = Outcome{last.back(), DifferenceOf(last.back(), heap)};
  }
}

/// Each of the sites is a group, from 1 on.
void Advice::WriteOperations(OperationsFile& operations,
                             const std::vector<std::uint32_t>& pooled) const {
  std::vector<std::uint8_t> groupOf(statistics.sites.size());
  for (std::size_t i = 0; i < pooled.size(); ++i)
    groupOf[pooled[i]] = static_cast<std::uint8_t>(i + 1);
  Recording again = OpenRecording(request.file);
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
  std::uint64_t all = 0, chosen = 0;
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

std::vector<Variant> Advice::VariantsOf(std::uint64_t pooled) const {
  // Larger requests of the sites would be blocks of their own.
  PoolSettings plain;
  constexpr std::uint64_t defaultRecord = 996, alignment = 4;
  for (const SiteAdvice& one : sites)
    if (const std::uint64_t size = statistics.sites[one.site].maxSize;
        one.isChosen && size + 8 > defaultRecord && size < 8000)
      plain.maxRecordSize =
          std::max(plain.maxRecordSize, static_cast<unsigned>((size + 8 + alignment) / 4 * 4));
  std::vector<Variant> variants{{.name = "heap"}};
  const auto add = [&](const char* name, auto change, bool resets = false) {
    PoolSettings settings = plain;
    change(settings);
    variants.push_back({.name = name, .pooled = pooled, .settings = settings, .resets = resets});
  };
  add("pools", [](PoolSettings&) {});
  add("pools that keep empty buckets", [](PoolSettings& one) { one.keepEmptyBuckets = true; });
  add(
      "pools with Reset", [](PoolSettings&) {}, true);
  add("pools, buckets of 16,000 bytes", [](PoolSettings& one) { one.bucketSize = 16000; });
  add("pools, buckets of 65,535 bytes", [](PoolSettings& one) { one.bucketSize = 65535; });
  if (plain.maxRecordSize == 0)
    add("pools, buckets of 1,004 bytes", [](PoolSettings& one) {
      one.bucketSize = 1004;
      one.maxRecordSize = 240;
    });
  add("pools, data alignment 16", [](PoolSettings& one) {
    one.dataAlignment = 16;
    one.maxRecordSize = one.maxRecordSize / 16 * 16 + (one.maxRecordSize > 0 ? 16 : 0);
  });
  for (const auto& [name, path] : FindAllocators())
    variants.push_back({.name = name, .allocator = path});
  return variants;
}

/// The fastest with pools. Where only other allocators pay, that is an answer as well.
const Outcome* Advice::FindBest() const {
  const Outcome* found = nullptr;
  for (const Outcome& outcome : outcomes)
    if (outcome.variant.pooled != 0 &&
        (found == nullptr || outcome.difference.mean < found->difference.mean))
      found = &outcome;
  return found;
}

} // namespace VOK::MemPool::Tools
