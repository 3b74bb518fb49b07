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
#include <cstdlib>
#include <memory>
#include <string>
#include <unistd.h>
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

/// A file that goes with the object.
class TemporaryFile {
public:
  TemporaryFile() : path(TemporaryName()) { close(mkstemp(path.data())); }
  ~TemporaryFile() { unlink(path.c_str()); }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;

  const std::string& GetPath() const { return path; }

private:
  std::string path;
};

void Run(const Options& options) {
  AdviceRequest request = options.request;
  const TemporaryFile own;
  request.file = options.runs ? own.GetPath() : options.words.front();
  if (options.runs) RecordProgram({.file = own.GetPath(), .program = options.words});
  if (!options.runs && options.words.size() > 1)
    throw CLI::ValidationError("FILE", "takes one file; a program is run with --run");
  request.measures = !options.noReplay;
  const Advice advice(request);
  if (!options.page.empty()) WriteFile(options.page, FillPage(advisePage, advice.GetJson()));
  if (options.page == "-") return;
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
