// vokmempool replay: a recording or a pool's trace on the library, under settings to try.
// Test: tests/tools/record_test.py.
#include "advise/Measure.h"
#include "advise/OperationsFile.h"
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Programs.h"
#include "common/Tool.h"
#include "trace/Ledger.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <fmt/format.h>
#include <memory>
#include <optional>
#include <unordered_map>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string file;
  PoolSettings settings;
  bool resets = false, detailed = false;
  unsigned rounds = 10;
  std::optional<std::uint64_t> reportAt;
};

bool IsRecording(const std::string& path) {
  Input input(path);
  std::string start(recordingMagic.size(), 0);
  start.resize(input.Read(start.data(), start.size()));
  return start == recordingMagic;
}

/// All requests come from one pool.
std::uint64_t TakeRecording(const std::string& path, const std::string& name,
                            OperationsFile& operations) {
  Recording recording = OpenRecording(path, name);
  for (RecordedEvent event; recording.Next(event);)
    operations.Take(event, 1);
  return recording.numEvents;
}

/// The lines of a trace as events: each pool is a group, as far as there are groups.
class TraceEvents {
public:
  explicit TraceEvents(OperationsFile& operations_) : operations(operations_) {}

  void Take(LineNumber line, const TraceEvent& traced) {
    const TraceLedger::Verdict verdict = ledger.Take(line, traced);
    if (verdict.cleared != 0) FreeAll(verdict.cleared);
    if (traced.letter == 'd') FreeAll(traced.pool);
    if (verdict.outcome != TraceLedger::Outcome::Done) return;
    auto& blocks = pools[traced.pool];
    if (traced.letter == 'a') {
      blocks[traced.data] = ++lastBlock;
      Put({.kind = Entry::Malloc, .block = lastBlock, .size = traced.size}, GroupOf(traced.pool));
    } else if (traced.letter == 'f') {
      if (const auto found = blocks.find(traced.data); found != blocks.end()) {
        Put({.kind = Entry::Free, .block = found->second}, 0);
        blocks.erase(found);
      }
    }
  }

  std::uint64_t GetNumEvents() const { return numEvents; }

private:
  std::uint8_t GroupOf(std::uint64_t pool) {
    const auto next =
        static_cast<std::uint8_t>(std::min<std::size_t>(groups.size() + 1, mostGroups - 1));
    return groups.try_emplace(pool, next).first->second;
  }
  void FreeAll(std::uint64_t pool) {
    for (const auto& [data, block] : pools[pool])
      Put({.kind = Entry::Free, .block = block}, 0);
    pools.erase(pool);
  }
  void Put(const RecordedEvent& event, std::uint8_t group) {
    operations.Take(event, group);
    ++numEvents;
  }

  OperationsFile& operations;
  TraceLedger ledger;
  std::unordered_map<std::uint64_t, std::uint8_t> groups;
  std::unordered_map<std::uint64_t, std::map<std::uint64_t, std::uint64_t>> pools;
  std::uint64_t lastBlock = 0, numEvents = 0;
};

std::uint64_t TakeTrace(const std::string& path, const std::string& name,
                        OperationsFile& operations) {
  Input input(path);
  Progress progress(input.GetSize());
  TraceEvents events(operations);
  LineNumber number = 0;
  ForEachLine(input, progress, [&](std::string_view line, bool) {
    TraceEvent traced;
    ++number;
    if (ReadTraceLine(line, traced) == LineKind::Event) events.Take(number, traced);
    return true;
  });
  if (events.GetNumEvents() == 0)
    throw Failure(fmt::format("{}: is neither a recording nor has it a trace line", name));
  return events.GetNumEvents();
}

void Run(const Options& options) {
  const HeldFile file(options.file);
  const std::string name = NameOfFile(options.file);
  const bool isRecording = IsRecording(file.GetPath());
  OperationsFile operations({0, options.reportAt.value_or(~std::uint64_t(0))}, !isRecording);
  const std::uint64_t events =
      (isRecording ? TakeRecording : TakeTrace)(file.GetPath(), name, operations);
  operations.Write();
  std::vector<Variant> variants{{.name = "heap"},
                                {.name = "pool",
                                 .pooled = ~std::uint64_t(1), // not the first group
                                 .settings = options.settings,
                                 .resets = options.resets}};
  if (options.reportAt)
    return Print(ReportOf(operations.GetPath(), variants.back(), options.detailed));

  Measure(operations.GetPath(), variants, options.rounds);
  std::string text = fmt::format("{} events, {} rounds\n", events, options.rounds);
  for (const Variant& variant : variants) {
    const Interval seconds = IntervalOf(variant.seconds);
    text += fmt::format(
        "{}  {:9.1f} ms [{:.1f}, {:.1f}]  {:>10} KiB at the peak{}\n", variant.name,
        1e3 * seconds.mean, 1e3 * seconds.low, 1e3 * seconds.high, variant.bytes / 1024,
        variant.pooled != 0 ? fmt::format(", pools held up to {} bytes", variant.bytesHeld) : "");
  }
  Print(text);
}

} // namespace

void AddReplay(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "replay", "Replays a recording or a trace on the library, under settings to try");
  command
      ->add_option("FILE", options->file,
                   "a file of record, or a program's output with trace "
                   "lines")
      ->required();
  const auto size = [&](const char* name, unsigned& value) {
    command->add_option(name, value, "bytes; the default is the library's")
        ->check(NumberFrom<unsigned>(1, UINT32_MAX, "bytes"));
  };
  size("--bucket-size", options->settings.bucketSize);
  size("--data-alignment", options->settings.dataAlignment);
  size("--max-record-size", options->settings.maxRecordSize);
  size("--min-record-size", options->settings.minRecordSize);
  command->add_flag("--keep-empty-buckets", options->settings.keepEmptyBuckets,
                    "keep buckets without a used record");
  command->add_flag("--reset", options->resets,
                    "reset a pool in place of a row of releases that empties it");
  command->add_option("--rounds", options->rounds, "rounds of replays")
      ->capture_default_str()
      ->check(NumberFrom(2u, 1000u, "a number of rounds"));
  CLI::Option* const at =
      command->add_option("--report-at", options->reportAt, "print the pools after this event")
          ->check(NumberFrom<std::uint64_t>(1, UINT64_MAX, "the number of an event"));
  command->add_flag("--detailed", options->detailed, "each bucket with its records")->needs(at);
  command->footer("Example: what would larger buckets take?\n"
                  "  vokmempool replay --bucket-size 16000 vokmempool.rec");
  command->callback([options] {
    try {
      Run(*options);
    } catch (const ProgramFailure& failure) {
      if (failure.status == badSettings) throw CLI::ValidationError(failure.what());
      throw;
    }
  });
}

} // namespace VOK::MemPool::Tools
