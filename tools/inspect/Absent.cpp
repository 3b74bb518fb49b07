// What reads another process, where it can't be built.
#include "common/Tool.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

namespace {

void AddAbsent(CLI::App& app, const char* name) {
  CLI::App* const command = app.add_subcommand(name, "Not in this build: Linux alone has it");
  command->allow_extras();
  command->callback(
      [name] { throw Failure(fmt::format("{} is not in this build: Linux alone has it", name)); });
}

} // namespace

void AddInspect(CLI::App& app) { AddAbsent(app, "inspect"); }
void AddTop(CLI::App& app) { AddAbsent(app, "top"); }
void AddRecord(CLI::App& app) { AddAbsent(app, "record"); }
void AddAdvise(CLI::App& app) { AddAbsent(app, "advise"); }
void AddReplay(CLI::App& app) { AddAbsent(app, "replay"); }

} // namespace VOK::MemPool::Tools
