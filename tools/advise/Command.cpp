// vokmempool advise: whether pools would help a recorded program, by replaying what it asked.
// Test: tests/tools/record_test.py.
#include "advise/Advice.h"
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Tool.h"

#include <CLI/CLI.hpp>
#include <memory>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  AdviceRequest request;
  bool json = false, noReplay = false;
};

void Run(const Options& options) {
  AdviceRequest request = options.request;
  request.measures = !options.noReplay;
  const Advice advice(request);
  Print(options.json ? advice.GetJson().dump(2, ' ', false,
                                             nlohmann::ordered_json::error_handler_t::replace) +
                           "\n"
                     : advice.GetText());
}

} // namespace

void AddAdvise(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "advise", "Answers whether pools would help a recorded program, and where");
  command->add_option("FILE", options->request.file, "A file of record")->required();
  command->add_flag("--json", options->json, "The figures as JSON");
  command->add_flag("--no-replay", options->noReplay, "Statistics alone, nothing is measured");
  command->add_option("--rounds", options->request.rounds, "Rounds of replays")
      ->capture_default_str()
      ->check(NumberFrom(2u, 1000u, "a number of rounds"));
  command
      ->add_option("--events", options->request.mostEvents,
                   "The most events to replay; of a longer recording a part with the peak")
      ->capture_default_str()
      ->check(NumberFrom<std::uint64_t>(1000, 100000000, "a number of events"));
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
