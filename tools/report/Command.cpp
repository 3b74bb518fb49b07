// vokmempool report: finds the reports in a text and shows them in the form asked for.
// Test: tests/tools/tools_test.py.
#include "common/Commands.h"
#include "common/Files.h"
#include "report/Check.h"
#include "report/Json.h"
#include "report/Reader.h"
#include "report/Summary.h"
#include "report/Writer.h"

#include <CLI/CLI.hpp>
#include <memory>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string file = "-";
  bool json = false, summary = false, check = false, text = false, fromJson = false;
};

void Run(const Options& options) {
  const std::vector<Report> reports = ReadReportFile(options.file, options.fromJson);
  if (options.json)
    WriteJson(reports, Print);
  else if (options.check)
    PrintInconsistencies(reports, options.file);
  else if (options.text)
    for (const Report& report : reports)
      Print(WriteReport(report));
  else
    Print(Summarise(reports));
}

} // namespace

void AddReport(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "report", "Finds the reports of pools in a program's output and shows them");
  command->add_option("FILE", options->file, "the output to read, - for standard input");
  command->add_flag("--from-json", options->fromJson, "FILE is a document of --json");
  CLI::Option_group* const form = command->add_option_group("Form");
  form->add_flag("--summary", options->summary, "a table of the pools (if no other form is named)");
  form->add_flag("--json", options->json, "a JSON document of all that the reports say");
  form->add_flag("--check", options->check, "each inconsistency in a report, with its line");
  form->add_flag("--text", options->text, "the reports alone, as the library prints them");
  form->require_option(0, 1);
  command->footer("Example: is the pool's state consistent after this run?\n"
                  "  ./program | vokmempool report --check");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
