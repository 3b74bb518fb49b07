// vokmempool advise: whether pools would help a recorded program, by replaying what it asked.
// Test: tests/tools/record_test.py.
#include "advise/Advice.h"
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Page.h"
#include "common/Programs.h"
#include "common/Tool.h"
#include "record/Session.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <filesystem>
#include <fmt/format.h>
#include <memory>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

extern const Page advisePage;

namespace {

struct Options {
  AdviceRequest request;
  std::vector<std::string> words; ///< the recording's file, or the program
  std::string page;               ///< a file, empty for none
  bool runs = false, json = false, noReplay = false;
};

/// Of several processes the one with the largest recording: a driver starts what does the work.
HeldFile RecordLargest(const std::vector<std::string>& program) {
  namespace fs = std::filesystem;
  const TemporaryFolder folder;
  RecordProgram({.file = folder.GetPath() + "/recording", .isKept = false, .program = program});
  const std::vector<fs::path> files{fs::directory_iterator(folder.GetPath()), {}};
  if (files.size() > 1)
    fmt::print(stderr, "vokmempool: the advice is for the process with the largest recording\n");
  const auto bytesOf = [](const fs::path& file) { return file_size(file); };
  return HeldFile(*std::ranges::max_element(files, {}, bytesOf));
}

Advice MakeAdvice(const Options& options) {
  const HeldFile file =
      options.runs ? RecordLargest(options.words) : HeldFile(options.words.front());
  AdviceRequest request = options.request;
  request.file = file.GetPath();
  request.name = NameOfFile(options.words.front());
  request.measures = !options.noReplay;
  return Advice(request);
}

void Run(const Options& options) {
  if (!options.runs && options.words.size() > 1)
    throw CLI::ValidationError("FILE", "takes one file; a program is run with --run");
  const Advice advice = MakeAdvice(options);
  if (!options.page.empty()) WriteFile(options.page, FillPage(advisePage, advice.GetJson()));
  if (options.page == "-") return;
  using Json = nlohmann::ordered_json;
  Print(options.json ? advice.GetJson().dump(2, ' ', false, Json::error_handler_t::replace) + "\n"
                     : advice.GetText());
}

} // namespace

void AddAdvise(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "advise", "Answers whether pools would help a recorded program, and where");
  command
      ->add_option("FILE", options->words,
                   "a file of record; with --run a program and its "
                   "arguments, after --")
      ->required();
  command->add_flag("--run", options->runs, "record the program first");
  command->add_flag("--json", options->json, "a JSON document");
  command->add_option("--page", options->page,
                      "also a page for the browser: its file, or - for the page alone on standard "
                      "output");
  command->add_flag("--no-replay", options->noReplay, "statistics alone: nothing is measured");
  command->add_option("--rounds", options->request.rounds, "rounds of replays")
      ->capture_default_str()
      ->check(NumberFrom(2u, 1000u, "a number of rounds"));
  command
      ->add_option("--events", options->request.mostEvents,
                   "the most events to replay: of a longer recording a part with the peak")
      ->capture_default_str()
      ->check(NumberFrom<std::uint64_t>(1000, 100000000, "a number of events"));
  command->footer("Example: would pools help?\n  vokmempool advise --run -- ./program");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
