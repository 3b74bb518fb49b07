// vokmempool: reads what pools print, and pools. Exit status 0: done; 1: a failure, with one line
// on the error stream; 2: bad arguments.
#include "common/Files.h"
#include "common/Tool.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <csignal>
#include <cstdio>
#include <exception>
#include <fmt/format.h>
#include <numeric>
#include <string>
#include <utility>
#include <vector>

namespace {

using namespace VOK::MemPool;

/// How many characters differ at least.
std::size_t DistanceOf(const std::string& a, const std::string& b) {
  std::vector<std::size_t> row(b.size() + 1);
  std::iota(row.begin(), row.end(), 0);
  for (std::size_t i = 0; i < a.size(); ++i) {
    std::size_t diagonal = std::exchange(row[0], i + 1);
    for (std::size_t j = 0; j < b.size(); ++j)
      diagonal = std::exchange(
          row[j + 1], std::min({row[j + 1] + 1, row[j] + 1, diagonal + (a[i] == b[j] ? 0 : 1)}));
  }
  return row.back();
}

/// What is wrong with the arguments; for a mistyped subcommand the nearest, if one is near.
std::string Explain(const CLI::App& app, const char* first, const CLI::ParseError& error) {
  if (first == nullptr) return error.what();
  const auto all = app.get_subcommands([](const CLI::App*) { return true; });
  const auto distance = [&](const CLI::App* one) { return DistanceOf(first, one->get_name()); };
  const CLI::App* const nearest = *std::ranges::min_element(all, {}, distance);
  if (distance(nearest) == 0) return error.what();
  std::string text = fmt::format("there is no subcommand {}", Tools::OneLine(first));
  if (2 * distance(nearest) <= nearest->get_name().size() + 1)
    text += fmt::format(", the nearest is {}", nearest->get_name());
  return text;
}

int Run(int argc, char** argv) {
  CLI::App app(
      "Reads the reports and the trace lines of pools of libVokMemPool, and the pools themselves.",
      "vokmempool");
  app.require_subcommand(1);
  app.set_version_flag("--version", "vokmempool " VOK_MEMPOOL_VERSION);
  app.footer("Help on a subcommand: vokmempool SUBCOMMAND --help");
  Tools::AddReport(app);
  Tools::AddPicture(app);
  Tools::AddTrace(app);
  Tools::AddChart(app);
  Tools::AddInspect(app);
  Tools::AddTop(app);
  Tools::AddRecord(app);
  Tools::AddAdvise(app);
  Tools::AddReplay(app);
  try {
    app.parse(argc, argv);
  } catch (const CLI::Success& help) {
    return app.exit(help);
  } catch (const Tools::ExitStatus& exit) {
    return exit.status;
  } catch (const CLI::ParseError& error) {
    fmt::print(stderr, "vokmempool: {}\nusage: vokmempool SUBCOMMAND [OPTIONS] [FILE]\n",
               Explain(app, argv[1], error));
    return 2;
  }
  return 0;
}

} // namespace

int main(int argc, char** argv) {
#ifdef SIGPIPE
  // A closed pipe ends the program without a message, even if its parent ignores the signal.
  std::signal(SIGPIPE, SIG_DFL);
#endif
  try {
    const int status = Run(argc, argv);
    if (std::fflush(stdout) != 0) throw Tools::Failure("standard output: can't be written");
    return status;
  } catch (const std::exception& error) {
    std::fflush(stdout);
    fmt::print(stderr, "vokmempool: {}\n", error.what());
    return 1;
  }
}
