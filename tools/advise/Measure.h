// Replays in processes of their own, in rounds that take each variant in turn, and what they took.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_MEASURE_H
#define VOK_MEMPOOL_TOOLS_ADVISE_MEASURE_H

#include <cstdint>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// The settings of a pool; 0 is "as set".
struct PoolSettings {
  unsigned bucketSize = 0, minRecordSize = 0, maxRecordSize = 0, dataAlignment = 0;
  bool keepEmptyBuckets = false;

  /// As an initialiser of Options, and as keys of the environment.
  std::string GetOptions() const;
  std::string GetKeys() const;
};

/// A mean with its 95% confidence interval.
struct Interval {
  double mean = 0, low = 0, high = 0;
};

Interval IntervalOf(const std::vector<double>& values);

/// One way to serve the operations.
struct Variant {
  std::string name;
  std::uint64_t pooled = 0; ///< a bit for each group that has a pool
  PoolSettings settings{};
  bool resets = false;
  std::string allocator{}; ///< a library to preload

  /// What a variant with pools is called: what differs from pools as set.
  std::string GetName() const;

  std::vector<double> seconds{}; ///< of each round
  std::uint64_t bytes = 0;       ///< resident in the heap at the peak
  std::uint64_t bytesHeld = 0;   ///< by the pools, at their own peaks
};

/// Replays each variant once in each of `rounds`. Fails if a replay does.
void Measure(const std::string& operations, std::vector<Variant>& variants, unsigned rounds);

/// The library's report of each pool after the operations.
std::string ReportOf(const std::string& operations, const Variant& variant, bool detailed);

/// The seconds that a variant takes more than another, round by round.
Interval DifferenceOf(const Variant& variant, const Variant& base);

/// The other allocators that are installed, by name and path.
std::vector<std::pair<std::string, std::string>> FindAllocators();

} // namespace VOK::MemPool::Tools

#endif
