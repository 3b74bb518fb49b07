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

void Test(const Options& options) {
  const std::uint32_t alignment = options.dataAlignment.Or(Settings::dataAlignment);
  if (alignment > maxDataAlignment)
    Refuse(Sum("the data alignment is no number of 16 bits", alignment, 0, ">", maxDataAlignment));
  const std::uint32_t bucketSize =
      std::min(options.bucketSize.Or(Settings::bucketSize), maxBucketSize);
  const RecSizeRange range =
      Normalise(options.minRecordSize.Or(Settings::minRecordSize),
                options.maxRecordSize.Or(Settings::maxRecordSize), std::max(alignment, 1u));
  if (range.max + recHeaderSize > bucketSize)
    Refuse(Sum("the largest record and its header don't fit into a bucket", range.max,
               recHeaderSize, ">", bucketSize));
  if (range.min > range.max)
    Refuse(Sum("the smallest record is larger than the largest", range.min, 0, ">", range.max));
  if (options.limit != 0 && !options.on.Or(!Settings::off))
    Refuse("a limit needs pooling on: the blocks of the heap can't be counted");
}

} // namespace

Mgr::Mgr(const char* name, const Options& options) : bucketMgr(nullptr) {
  Test(options);
  const std::string text = name != nullptr ? name : MgrRegistry::NextAutomaticName();
  if (MgrRegistry::Contains(text)) RefuseName(text);
  auto block = std::make_unique<PoolBlock>(this, text, options);
  if (options.limit != 0) block->budget.limit = options.limit;
  block->budget.atLimit = options.atLimit;
  block->budget.context = options.context;
  bucketMgr = &block->pool;
  if (!MgrRegistry::Enter(text, bucketMgr)) RefuseName(text);
  static_cast<void>(block.release());
}

} // namespace VOK::MemPool
