// vokmempool inspect: the pools of a running process, or of a core file, without the program's
// help. Test: tests/tools/inspect_test.py.
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Tool.h"
#include "inspect/Pools.h"
#include "report/Check.h"
#include "report/Formats.h"
#include "report/Summary.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <fmt/format.h>
#include <fstream>
#include <memory>
#include <optional>
#include <thread>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string source;
  bool stop = false, json = false, summary = false, check = false, text = false, prometheus = false;
  double every = 0; ///< seconds between two rounds

  bool NeedsRecords() const { return json || check || text; }

  /// The process that `source` names, if it isn't a file.
  std::optional<int> GetProcess() const {
    int process = 0;
    const char* const end = source.data() + source.size();
    const auto [last, error] = std::from_chars(source.data(), end, process);
    return error == std::errc() && last == end ? std::optional(process) : std::nullopt;
  }
};

Pools Read(const Options& options) {
  try {
    const std::optional<int> process = options.GetProcess();
    if (!process) return ReadPools(MemoryOfCore(options.source), options.NeedsRecords());
    Memory memory = MemoryOfProcess(*process);
    if (!options.stop) return ReadPools(memory, options.NeedsRecords());
    const Freeze freeze(*process);
    memory.isChanging = false;
    return ReadPools(memory, options.NeedsRecords());
  } catch (const Failure& failure) {
    throw Failure(fmt::format("{}: {}", options.source, failure.what()));
  }
}

/// The damages of the registry and of all pools that don't move.
std::vector<std::string> DamagesOf(const Pools& pools) {
  std::vector<std::string> damages = pools.damages;
  for (const Pool& pool : pools.all)
    for (const std::string& damage : pool.damages)
      if (pool.IsDamaged())
        damages.push_back(fmt::format("pool {}: {}", OneLine(pool.report.name), damage));
  return damages;
}

std::string MarkOf(const Pool& pool) {
  return pool.isMoving ? " moving" : pool.IsDamaged() ? " damaged" : "";
}

void Show(const Options& options) {
  Pools pools = Read(options);
  const std::vector<std::string> damages = DamagesOf(pools);
  const auto numMoving = std::ranges::count(pools.all, true, &Pool::isMoving);
  if (numMoving > 0)
    fmt::print(stderr, "vokmempool: {}: {} of {} pools moving; --stop holds the process\n",
               options.source, numMoving, pools.all.size());
  if (options.check) std::erase_if(pools.all, [](const Pool& pool) { return pool.isMoving; });
  std::vector<std::string> marks;
  std::vector<Report> reports;
  for (Pool& pool : pools.all) {
    marks.push_back(MarkOf(pool));
    reports.push_back(std::move(pool.report));
  }
  if (options.json)
    WriteJson(reports, Print);
  else if (options.prometheus)
    Print(PrometheusText(reports));
  else if (options.text)
    for (const Report& report : reports)
      Print(WriteReport(report));
  else if (options.check) {
    for (const std::string& damage : damages)
      Print(damage + "\n");
    if (const std::string count = PrintInconsistencies(reports); !count.empty() && damages.empty())
      throw Failure(fmt::format("{}: {}", options.source, count));
  } else
    Print(Summarise(reports, marks));
  if (!damages.empty())
    throw Failure(fmt::format("{}: {} damage{}, the first: {}", options.source, damages.size(),
                              damages.size() == 1 ? "" : "s", damages.front()));
}

/// A process that has ended has no memory, also while its parent hasn't asked for its status.
bool HasMemory(const std::string& process) {
  return std::ifstream("/proc/" + process + "/maps").peek() != std::ifstream::traits_type::eof();
}

/// Until the process ends.
void ShowAgainAndAgain(const Options& options) {
  do {
    Show(options);
    std::fflush(stdout);
    std::this_thread::sleep_for(std::chrono::duration<double>(options.every));
  } while (HasMemory(options.source));
}

void Run(const Options& options) {
  if (options.stop && !options.GetProcess())
    throw CLI::ValidationError("--stop", "only a process can be stopped");
  if (options.every > 0 && !options.GetProcess())
    throw CLI::ValidationError("--every", "only a process changes");
  options.every > 0 ? ShowAgainAndAgain(options) : Show(options);
}

} // namespace

void AddInspect(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command =
      app.add_subcommand("inspect", "Shows the pools of a running process or of a core file");
  command->add_option("PID|CORE", options->source, "the process, or the core file")->required();
  command->add_flag("--stop", options->stop, "stop the process while it is read");
  command->add_option("--every", options->every, "seconds until the process is read again")
      ->check(NumberFrom(0.01, 86400.0, "seconds"));
  CLI::Option_group* const form = command->add_option_group("Form");
  form->add_flag("--summary", options->summary, "a table of the pools (if no other form is named)");
  form->add_flag("--json", options->json, "a JSON document of all that DbgDetailed would print");
  form->add_flag("--check", options->check, "each damage, and each inconsistency with its line");
  form->add_flag("--text", options->text, "what DbgDetailed would print");
  form->add_flag("--prometheus", options->prometheus, "the figures of each pool as metrics");
  form->require_option(0, 1);
  command->footer("Example: which pool holds the memory of this process?\n"
                  "  vokmempool inspect $(pidof program)\n"
                  "  vokmempool inspect --text --every 5 $(pidof program) > growth.txt");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
