// vokmempool: reads what pools print, and pools. Exit status 0: done; 1: a failure, with one line
// on the error stream; 2: bad arguments.
#include "common/Commands.h"
#include "common/Failure.h"
#include "common/Files.h"

#include <CLI/CLI.hpp>
#include <csignal>
#include <cstdio>
#include <exception>
#include <fmt/format.h>

namespace {

using namespace VOK::MemPool;

int Run(int argc, char** argv) {
  CLI::App app(
      "Reads the reports and the trace lines of pools of libVokMemPool, and the pools themselves.",
      "vokmempool");
  app.require_subcommand(1);
  app.footer("Help on a subcommand: vokmempool SUBCOMMAND --help");
  Tools::AddReport(app);
  Tools::AddPicture(app);
  Tools::AddTrace(app);
  Tools::AddChart(app);
  Tools::AddInspect(app);
  try {
    app.parse(argc, argv);
  } catch (const CLI::Success& help) {
    return app.exit(help);
  } catch (const CLI::ParseError& error) {
    fmt::print(stderr, "vokmempool: {}\nusage: vokmempool SUBCOMMAND [OPTIONS] [FILE]\n",
               error.what());
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
