// What `vokmempool advise` answers: the statistics of a recording, and what replays with pools
// took. Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_ADVICE_H
#define VOK_MEMPOOL_TOOLS_ADVISE_ADVICE_H

#include "advise/Measure.h"
#include "advise/OperationsFile.h"
#include "advise/Plan.h"
#include "advise/Statistics.h"

#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct AdviceRequest {
  std::string file; ///< is read twice
  std::string name; ///< of the file, for messages
  unsigned rounds = 10;
  std::uint64_t mostEvents = 20000000; ///< that are replayed
  bool measures = true;                ///< else statistics alone
};

/// A call site with the most requests.
struct SiteAdvice {
  std::uint32_t site;
  Verdict verdict;
  std::string change;              ///< how it would move to a pool
  std::optional<Interval> seconds; ///< more than the heap, with this site alone in a pool
  bool isChosen = false;           ///< in the best grouping
};

/// A variant beside the heap's time in the same rounds.
struct Outcome {
  Variant variant;
  Interval difference; ///< seconds more than the heap
};

class Advice {
public:
  /// Fails if the file is no recording, or if a replay fails.
  explicit Advice(const AdviceRequest& request);

  std::string GetText() const;
  nlohmann::ordered_json GetJson() const;

  /// The answer in one sentence.
  std::string GetAnswer() const;

  const AdviceRequest request;
  Recording recording;
  Statistics statistics;
  std::vector<SiteAdvice> sites; ///< by requests, the most first

  // Of the replays. Without candidates there are none.
  Part part; ///< of the recording, that is replayed
  bool IsWhole() const { return part.first == 0 && part.last >= recording.numEvents; }
  Variant heap;                  ///< of the last rounds
  std::vector<Outcome> outcomes; ///< of the grouping: settings, Reset, other allocators
  std::optional<Outcome> best;   ///< measured again, in rounds of its own

  /// What the program would take more with the best: the replays' difference, its interval wider by
  /// a quarter of it. That much replays were off in docs/advise.md: they lack the program's own
  /// work, which runs beside the heap's.
  Interval GetForecast() const;

  /// What to do in the source for the best.
  std::vector<std::string> GetChanges() const;

  bool Pays() const { return best && GetForecast().high < 0; }

private:
  void JudgeSites();
  void Replay();
  void WriteOperations(OperationsFile& operations, const std::vector<std::uint32_t>& pooled) const;
  std::uint64_t ChooseGrouping(const std::string& operations);
  Variant PlainPools(std::uint64_t pooled) const;
  void Try(const std::string& operations, std::vector<Variant> variants);
  bool WasTried(const std::string& name) const;
  const Outcome& FindBest() const;
};

} // namespace VOK::MemPool::Tools

#endif
