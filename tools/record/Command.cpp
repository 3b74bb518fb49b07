// vokmempool record: runs a program and records what it asks of its heap, a file for each process.
// Test: tests/tools/record_test.py.
#include "common/Numbers.h"
#include "common/Tool.h"
#include "record/Ring.h"
#include "record/Session.h"

#include <CLI/CLI.hpp>
#include <memory>

namespace VOK::MemPool::Tools {

void AddRecord(CLI::App& app) {
  auto request = std::make_shared<RecordRequest>();
  CLI::App* const command = app.add_subcommand(
      "record", "Runs a program and records what it asks of its heap, for advise and replay");
  command
      ->add_option("-o,--output", request->file,
                   "the recording; those of further processes are FILE.2, FILE.3, ...")
      ->capture_default_str();
  command->add_option("--depth", request->depth, "return addresses of each call stack")
      ->capture_default_str()
      ->check(NumberFrom(1u, Record::maxDepth, "a number of return addresses"));
  command->add_option("PROGRAM", request->program, "the program and its arguments, after --")
      ->required();
  command->positionals_at_end();
  command->footer("Example: would pools help?\n"
                  "  vokmempool record -- ./program; vokmempool advise vokmempool.rec");
  command->callback([request] {
    if (request->file == "-")
      throw CLI::ValidationError("--output", "takes a file; standard output is the program's");
    throw ExitStatus{RecordProgram(*request)};
  });
}

} // namespace VOK::MemPool::Tools
