// A pool made to order: its options over the settings, and the tests that throw where the settings
// alone would end the process.
// Test: tests/options_test.cpp.
#include "MemPool"
#include "engine/BucketMgr.h"
#include "engine/Budget.h"
#include "services/MgrRegistry.h"
#include "services/Settings.h"

#include <algorithm>
#include <memory>
#include <stdexcept>
#include <string>

namespace VOK::MemPool {

namespace {

Settings::Snapshot Over(Settings::Snapshot settings, const Options& options) {
  return {options.bucketSize.Or(settings.bucketSize),
          options.dataAlignment.Or(settings.dataAlignment),
          options.maxRecordSize.Or(settings.maxRecordSize),
          options.minRecordSize.Or(settings.minRecordSize),
          options.keepEmptyBuckets.Or(settings.keepEmptyBuckets),
          options.on.Or(settings.on),
          options.checked.Or(settings.checked),
          options.endsAtFinding.Or(settings.endsAtFinding)};
}

[[noreturn]] void Refuse(const std::string& why) { throw std::invalid_argument(why); }

[[noreturn]] void RefuseName(const std::string& name) {
  Refuse("a pool of the name '" + name + "' exists");
}

std::string Sum(const char* name, std::uint64_t size, std::uint64_t more, const char* relation,
                std::uint64_t bound) {
  return std::string(name) + " (" + std::to_string(size) +
         (more != 0 ? " + " + std::to_string(more) : "") + ' ' + relation + ' ' +
         std::to_string(bound) + ')';
}

void Test(const Settings::Snapshot& settings, const Options& options) {
  if (settings.dataAlignment > maxDataAlignment)
    Refuse(Sum("the data alignment is no number of 16 bits", settings.dataAlignment, 0, ">",
               maxDataAlignment));
  const std::uint32_t bucketSize = std::min(settings.bucketSize, maxBucketSize);
  const RecSizeRange range = Normalise(settings.minRecordSize, settings.maxRecordSize,
                                       std::max(settings.dataAlignment, 1u));
  if (range.max + recHeaderSize > bucketSize)
    Refuse(Sum("the largest record and its header don't fit into a bucket", range.max,
               recHeaderSize, ">", bucketSize));
  if (range.min > range.max)
    Refuse(Sum("the smallest record is larger than the largest", range.min, 0, ">", range.max));
  if (options.limit != 0 && !settings.on)
    Refuse("a limit needs pooling on: the blocks of the heap can't be counted");
}

} // namespace

Mgr::Mgr(const char* name, const Options& options) : bucketMgr(nullptr) {
  const Settings::Snapshot settings = Over(Settings::Now(), options);
  Test(settings, options);
  const std::string text = name != nullptr ? name : MgrRegistry::NextAutomaticName();
  if (MgrRegistry::Contains(text)) RefuseName(text);
  auto block = std::make_unique<PoolBlock>(this, text, settings, options);
  if (options.limit != 0) block->budget.limit = options.limit;
  block->budget.atLimit = options.atLimit;
  block->budget.context = options.context;
  if (!MgrRegistry::Enter(text, &block->pool)) RefuseName(text);
  bucketMgr = &block.release()->pool;
}

} // namespace VOK::MemPool
