#include "advise/Measure.h"

#include "common/Files.h"
#include "common/Programs.h"
#include "common/Tool.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <fmt/format.h>
#include <numeric>
#include <string_view>

namespace VOK::MemPool::Tools {

namespace {

/// Keys of the environment would set what the variant leaves "as set".
std::vector<std::string> EnvironmentOf(const Variant& variant) {
  std::vector<std::string> variables = Environment("ZOR_VOK_MEMPOOL_");
  if (!variant.allocator.empty()) variables.push_back("LD_PRELOAD=" + variant.allocator);
  return variables;
}

std::vector<std::string> ArgumentsOf(const Variant& variant, const std::string& operations) {
  const PoolSettings& settings = variant.settings;
  std::vector<std::string> arguments{"vokmempool-replay", operations,
                                     std::to_string(variant.pooled)};
  for (const unsigned number :
       {settings.bucketSize, settings.minRecordSize, settings.maxRecordSize, settings.dataAlignment,
        settings.keepEmptyBuckets ? 1u : 0u, variant.resets ? 1u : 0u})
    arguments.push_back(std::to_string(number));
  return arguments;
}

/// What a replay printed.
struct Output {
  unsigned long long nanoseconds, bytes, bytesHeld;
};

Output Replay(const std::string& operations, const Variant& variant) {
  const std::string text = RunProgram(FindHelper("vokmempool-replay"),
                                      ArgumentsOf(variant, operations), EnvironmentOf(variant));
  Output output{};
  if (std::sscanf(text.c_str(), "%llu %llu %llu", &output.nanoseconds, &output.bytes,
                  &output.bytesHeld) != 3)
    throw Failure(fmt::format("the replay \"{}\" failed", variant.name));
  return output;
}

std::string Joined(const PoolSettings& settings, std::string_view separator, auto form) {
  std::string text;
  const auto add = [&](unsigned value, const char* option, const char* key) {
    if (value != 0) text += (text.empty() ? "" : std::string(separator)) + form(option, key, value);
  };
  add(settings.bucketSize, "BucketSize", "BUCKET_SIZE");
  add(settings.minRecordSize, "MinRecordSize", "MIN_RECORD_SIZE");
  add(settings.maxRecordSize, "MaxRecordSize", "MAX_RECORD_SIZE");
  add(settings.dataAlignment, "DataAlignment", "DATA_ALIGNMENT");
  add(settings.keepEmptyBuckets ? 1 : 0, "KeepEmptyBuckets", "KEEP_EMPTY_BUCKETS");
  return text;
}

} // namespace

std::string PoolSettings::GetOptions() const {
  const std::string more = Joined(*this, "", [](const char* option, const char*, unsigned value) {
    return value == 1 ? fmt::format(".{}()", option) : fmt::format(".{}({})", option, value);
  });
  return "VOK::MemPool::Options().On()" + more;
}

std::string PoolSettings::GetKeys() const {
  const std::string more = Joined(*this, " ", [](const char*, const char* key, unsigned value) {
    return fmt::format("ZOR_VOK_MEMPOOL_{}={}", key, value);
  });
  return "ZOR_VOK_MEMPOOL_ON=1" + (more.empty() ? "" : " " + more);
}

std::string Variant::GetName() const {
  std::string text = "pools";
  const auto add = [&](const char* word, unsigned number) {
    if (number != 0) text += fmt::format(", {} {}", word, number);
  };
  if (resets) text += ", Reset";
  if (settings.keepEmptyBuckets) text += ", kept";
  add("buckets of", settings.bucketSize);
  add("records from", settings.minRecordSize);
  add("alignment", settings.dataAlignment);
  return text;
}

Interval IntervalOf(const std::vector<double>& values) {
  // The factors of Student's distribution for 95%, by degrees of freedom.
  constexpr std::array factors{12.706, 4.303, 3.182, 2.776, 2.571, 2.447, 2.365, 2.306,
                               2.262,  2.228, 2.201, 2.179, 2.160, 2.145, 2.131, 2.120,
                               2.110,  2.101, 2.093, 2.086, 2.080, 2.074, 2.069, 2.064,
                               2.060,  2.056, 2.052, 2.048, 2.045, 1.960};
  const std::size_t count = values.size();
  const double mean =
      std::accumulate(values.begin(), values.end(), 0.0) / static_cast<double>(count);
  double squares = 0;
  for (const double value : values)
    squares += (value - mean) * (value - mean);
  const double factor = factors[std::min(count - 2, factors.size() - 1)];
  const double half =
      factor * std::sqrt(squares / static_cast<double>(count - 1) / static_cast<double>(count));
  return {mean, mean - half, mean + half};
}

void Measure(const std::string& operations, std::vector<Variant>& variants, unsigned rounds) {
  Progress progress(rounds * variants.size(), "replays", 1);
  for (unsigned round = 0; round < rounds; ++round)
    for (std::size_t i = 0; i < variants.size(); ++i) {
      Variant& variant = variants[(i + round) % variants.size()];
      const Output output = Replay(operations, variant);
      variant.seconds.push_back(static_cast<double>(output.nanoseconds) / 1e9);
      variant.bytes = output.bytes;
      variant.bytesHeld = output.bytesHeld;
      progress.Add(1);
    }
}

std::string ReportOf(const std::string& operations, const Variant& variant, bool detailed) {
  std::vector<std::string> arguments = ArgumentsOf(variant, operations);
  arguments.emplace_back(detailed ? "DbgDetailed" : "Dbg");
  return RunProgram(FindHelper("vokmempool-replay"), arguments, EnvironmentOf(variant));
}

Interval DifferenceOf(const Variant& variant, const Variant& base) {
  std::vector<double> differences;
  for (std::size_t i = 0; i < base.seconds.size(); ++i)
    differences.push_back(variant.seconds[i] - base.seconds[i]);
  return IntervalOf(differences);
}

std::vector<std::pair<std::string, std::string>> FindAllocators() {
  namespace fs = std::filesystem;
  std::vector<std::pair<std::string, std::string>> found;
  for (const auto& [name, file] :
       {std::pair("mimalloc", "libmimalloc.so.2"), std::pair("jemalloc", "libjemalloc.so.2"),
        std::pair("tcmalloc", "libtcmalloc_minimal.so.4")})
    for (const std::string& folder : LibraryFolders())
      if (const fs::path path = fs::path(folder) / file; fs::exists(path)) {
        found.emplace_back(name, path);
        break;
      }
  return found;
}

} // namespace VOK::MemPool::Tools
