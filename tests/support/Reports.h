// What the tests of the reports share: pools on the arena, so that addresses are the same in every
// run; the run of a report, held to change nothing; the golden files that it must equal.
#ifndef VOK_MEMPOOL_TESTS_REPORTS_H
#define VOK_MEMPOOL_TESTS_REPORTS_H

#include "support/ArenaHeap.h"
#include "support/Process.h"

#include "services/Observers.h"

#include <functional>
#include <gtest/gtest.h>
#include <map>
#include <string>
#include <vector>

class Reports : public testing::Test {
protected:
  ArenaHeap heap;
  KeepSettings settings;
  CaughtOutput output;
  const VOK::MemPool::Observers::Quiet looking; // into each byte of the arena

  void SetUp() override;
  void TearDown() override;

  /// A pool that lives until the test's end, made under the default settings but for those of
  /// `set`, with pooling on.
  VOK::MemPool::Mgr& Make(const std::string& name, const std::string& set);

  /// `number` blocks of `size` bytes, in the order in which the pool gave them.
  static std::vector<void*> Alloc(VOK::MemPool::Mgr& pool, unsigned number, unsigned size);

  /// What `report` writes on standard output, messages with "#####" for their source line. It must
  /// write the same once more, change no block of the arena and leave none behind.
  std::string Report(const std::function<void()>& report);

  /// The bytes of all blocks that stand on the arena.
  std::map<const void*, std::string> Standing() const;

private:
  std::vector<VOK::MemPool::Mgr*> pools;
};

/// The lines that `after` lacks, behind "-", then those that it has beyond `before`, behind "+".
std::string Changes(const std::string& before, const std::string& after);

/// Expects that `text` equals the golden file of that name and of this pointer width, to the blank.
/// While VOK_MEMPOOL_APPROVE is in the environment it writes that file.
void ExpectGolden(const std::string& name, const std::string& text);

#endif
