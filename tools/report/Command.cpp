// vokmempool report: finds the reports in a text and shows them in the form asked for.
// Test: tests/tools/tools_test.py.
#include "common/Files.h"
#include "common/Tool.h"
#include "report/Check.h"
#include "report/Formats.h"
#include "report/Summary.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>
#include <memory>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string file = "-";
  bool json = false, summary = false, check = false, text = false, fromJson = false,
       lenient = false;
};

ReportText Read(const std::string& text, const Options& options) {
  if (options.fromJson) return ReadJson(text);
  if (!options.lenient) return ReadReports(text);
  PassedOver passed;
  ReportText result = ReadReportsLeniently(text, passed);
  if (const std::string said = passed.Say(); !said.empty())
    fmt::print(stderr, "vokmempool: {}: {}\n", NameOfFile(options.file), said);
  return result;
}

/// What ends the command, empty if all is well.
std::string Show(const std::vector<Report>& reports, const Options& options) {
  if (options.check) return PrintInconsistencies(reports);
  if (options.json)
    WriteJson(reports, Print);
  else if (options.text)
    for (const Report& report : reports)
      Print(WriteReport(report));
  else {
    Print(Summarise(reports));
    if (const std::string count = CountInconsistencies(reports); !count.empty())
      fmt::print(stderr, "vokmempool: {}: {}, --check lists them\n", NameOfFile(options.file),
                 count);
  }
  return "";
}

void Run(const Options& options) {
  const std::string content = Input(options.file).ReadAll();
  const ReportText text = Read(content, options);
  std::string failure;
  if (!text.reports.empty())
    failure = Show(text.reports, options);
  else if (text.cut.empty())
    failure = "there is no report in it";
  if (!failure.empty() && !text.cut.empty()) failure += "; ";
  failure += text.cut;
  if (!failure.empty()) throw Failure(fmt::format("{}: {}", NameOfFile(options.file), failure));
}

} // namespace

void AddReport(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command = app.add_subcommand(
      "report", "Finds the reports of pools in a program's output and shows them");
  command->add_option("FILE", options->file, "the output to read, - for standard input");
  CLI::Option* const fromJson =
      command->add_flag("--from-json", options->fromJson, "FILE is a document of --json");
  command
      ->add_flag("--lenient", options->lenient,
                 "pass over other lines in a report, prefixes of a log, missing blanks")
      ->excludes(fromJson);
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
