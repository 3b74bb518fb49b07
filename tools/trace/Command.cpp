// vokmempool trace: reads the trace lines in a program's output and shows what they add up to.
// Test: tests/tools/tools_test.py.
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Tool.h"
#include "diagnostics/ReportLayout.h"
#include "trace/History.h"
#include "trace/Replay.h"
#include "trace/Summary.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <fmt/format.h>
#include <memory>
#include <optional>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string file = "-", massif, massifPools;
  bool json = false, detailed = false, off = false, keepEmptyBuckets = false;
  std::vector<std::string> names;
  std::uint64_t at = 0;
  std::optional<unsigned> bucketSize, dataAlignment, maxRecordSize, minRecordSize;
};

/// POOL=NAME, with the address of the pool as the trace shows it.
PoolNames NamesOf(const Options& options) {
  PoolNames names;
  for (const std::string& text : options.names) {
    const std::size_t middle = text.find('=');
    std::uint64_t addr = 0;
    const char* const end = text.data() + std::min(middle, text.size());
    const auto result = std::from_chars(text.data(), end, addr, 16);
    if (middle == std::string::npos || result.ec != std::errc() || result.ptr != end)
      throw CLI::ValidationError("--name",
                                 "takes POOL=NAME, with a pool's address as in its lines");
    names.given[addr] = text.substr(middle + 1);
  }
  return names;
}

void ApplySettings(const Options& options) {
  ZOR_VOK_MEMPOOL_OFF(options.off);
  if (options.bucketSize) ZOR_VOK_MEMPOOL_BUCKET_SIZE(*options.bucketSize);
  if (options.dataAlignment) ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(*options.dataAlignment);
  if (options.maxRecordSize) ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(*options.maxRecordSize);
  if (options.minRecordSize) ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(*options.minRecordSize);
  if (options.keepEmptyBuckets) ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(true);
}

/// Takes the names of pools from the reports between the trace lines, whose pools have the same
/// addresses.
class NameFinder {
public:
  NameFinder(const TraceLedger& ledger_, PoolNames& names_) : ledger(ledger_), names(names_) {}

  void Take(std::string_view line) {
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (line.starts_with(PoolTitle::pool)) {
      name = line.substr(std::string_view(PoolTitle::pool).size());
      linesLeft = 3; // the version's line precedes that of the address
    } else if (linesLeft > 0 && line.starts_with(address)) {
      std::uint64_t addr = 0;
      std::from_chars(line.data() + address.size(), line.data() + line.size(), addr, 16);
      names.reported[ledger.GetIdAt(addr)] = name;
    }
    if (linesLeft > 0) --linesLeft;
  }

private:
  const std::string address = fmt::format("   {}0x", PoolLabel::addr);
  const TraceLedger& ledger;
  PoolNames& names;
  std::string name;
  int linesLeft = 0;
};

/// Reads all lines, or those up to the one to report; `take` gets each event with its line and what
/// the ledger finds. Returns the number of lines.
template <class Take>
std::uint64_t ReadTrace(const Options& options, TraceLedger& ledger, PoolNames& names, Take take) {
  Input input(options.file);
  Progress progress(input.GetSize());
  NameFinder finder(ledger, names);
  std::uint64_t number = 0;
  ForEachLine(input, progress, [&](std::string_view line, bool isWhole) {
    ++number;
    TraceEvent event;
    const LineKind kind = ReadTraceLine(line, event);
    if (kind == LineKind::Event && isWhole)
      take(number, event, ledger.Take(number, event));
    else if (kind != LineKind::Other)
      ledger.TakeMixed(number, line);
    else
      finder.Take(line);
    return number != options.at;
  });
  return number;
}

/// Says on the error stream why a rebuilt pool may differ from the traced one.
void WarnOf(const TraceLedger& ledger, const PoolNames& names) {
  for (const TracedPool* pool : ledger.GetLivePools()) {
    for (const ClearSpan& span : pool->clears.items)
      fmt::print(
          stderr,
          "vokmempool: {}: a Clear lies between line {} and line {}, the report is uncertain\n",
          OneLine(NameOf(names, pool->id)), span.after, span.before);
    if (pool->id.made == 0)
      fmt::print(stderr, "vokmempool: {}: its first lines are not in the trace\n",
                 OneLine(NameOf(names, pool->id)));
  }
  if (ledger.mixed.count > 0)
    fmt::print(stderr, "vokmempool: {} mixed or cut lines were skipped, the first is line {}\n",
               ledger.mixed.count, ledger.mixed.items.front().line);
}

void ShowPoolsAt(const Options& options) {
  PoolNames names = NamesOf(options);
  ApplySettings(options);
  TraceLedger ledger;
  Replay replay(names);
  const std::uint64_t numLines = ReadTrace(
      options, ledger, names, [&](LineNumber, const TraceEvent& event, const auto& verdict) {
        replay.Take(event, verdict);
      });
  if (numLines < options.at)
    throw Failure(fmt::format("{}: it has no line {}, only {}", NameOfFile(options.file),
                              options.at, numLines));
  WarnOf(ledger, names);
  replay.Print(options.detailed);
}

void WriteMassif(const Options& options, const std::vector<History::Snapshot>& snapshots,
                 const TraceLedger& ledger, const PoolNames& names) {
  if (!options.massif.empty())
    WriteFile(options.massif, MassifText(snapshots, ledger, names, options.file));
  if (options.massifPools.empty()) return;
  const auto texts = MassifTextsOfPools(snapshots, names, options.file);
  for (std::size_t i = 0; i < texts.size(); ++i)
    WriteFile(fmt::format("{}.{}", options.massifPools, i + 1), texts[i]);
}

void Run(const Options& options) {
  if (options.at != 0) return ShowPoolsAt(options);
  PoolNames names = NamesOf(options);
  TraceLedger ledger;
  History history;
  const std::uint64_t numLines =
      ReadTrace(options, ledger, names, [&](LineNumber line, const TraceEvent&, const auto&) {
        history.Sample(line, ledger);
      });
  if (ledger.numEvents == 0 && ledger.mixed.count == 0)
    throw Failure(fmt::format("{}: there is no trace line in it", NameOfFile(options.file)));
  WriteMassif(options, history.GetSnapshots(numLines, ledger), ledger, names);
  if (options.json)
    WriteTraceJson(ledger, numLines, names, Print);
  else
    Print(SummariseTrace(ledger, numLines, names));
}

} // namespace

void AddTrace(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "trace", "Reads trace lines and shows the pools and records that they add up to");
  command->add_option("FILE", options->file, "the output to read, - for standard input");
  command->add_option("--name", options->names, "POOL=NAME: the name of the pool at an address")
      ->expected(1)
      ->allow_extra_args(false)
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
  CLI::Option* const at =
      command->add_option("--at", options->at, "rebuild the pools as of this line, and report them")
          ->check(NumberFrom<std::uint64_t>(1, UINT64_MAX, "the number of a line"));
  command->add_flag("--json", options->json, "a JSON document")->excludes(at);
  command->add_option("--massif", options->massif, "also write a file for ms_print")->excludes(at);
  command
      ->add_option("--massif-pools", options->massifPools,
                   "also write a file for each pool: this name with .1, .2 and so on")
      ->excludes(at);
  const auto setting = [&](CLI::Option* option) { return option->needs(at)->group("With --at"); };
  const auto size = [&](const char* name, std::optional<unsigned>& value, const char* text) {
    setting(command->add_option(name, value, text))
        ->check(NumberFrom<unsigned>(0, UINT32_MAX, "bytes"));
  };
  setting(command->add_flag("--detailed", options->detailed, "each bucket with its records"));
  setting(command->add_flag("--off", options->off, "the program's pooling was off"));
  size("--bucket-size", options->bucketSize, "the program's setting");
  size("--data-alignment", options->dataAlignment, "likewise");
  size("--max-record-size", options->maxRecordSize, "likewise");
  size("--min-record-size", options->minRecordSize, "likewise");
  setting(command->add_flag("--keep-empty-buckets", options->keepEmptyBuckets, "likewise"));
  command->footer("Example: what is still in use, and what were the pools at line 1200?\n"
                  "  ZOR_VOK_MEMPOOL_TRACE=1 ./program > out.txt; vokmempool trace out.txt\n"
                  "  vokmempool trace --at 1200 --name 5581c0de=cache out.txt");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
