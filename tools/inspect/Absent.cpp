// vokmempool inspect where it can't be built.
#include "common/Tool.h"

#include <CLI/CLI.hpp>

namespace VOK::MemPool::Tools {

void AddInspect(CLI::App& app) {
  CLI::App* const command = app.add_subcommand("inspect", "Not in this build: Linux alone has it");
  command->allow_extras();
  command->callback([] { throw Failure("inspect is not in this build: Linux alone has it"); });
}

} // namespace VOK::MemPool::Tools
