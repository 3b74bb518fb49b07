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
  std::string file = "-", before, series;
  bool json = false, summary = false, check = false, text = false, prometheus = false,
       fromJson = false, lenient = false, records = false;
};

constexpr const char* noReport = "there is no report in it";

ReportText Read(const std::string& file, const Options& options) {
  const std::string text = Input(file).ReadAll();
  if (options.fromJson) return ReadJson(text);
  if (!options.lenient) return ReadReports(text);
  PassedOver passed;
  ReportText result = ReadReportsLeniently(text, passed);
  if (const std::string said = passed.Say(); !said.empty())
    fmt::print(stderr, "vokmempool: {}: {}\n", NameOfFile(file), said);
  return result;
}

std::string DifferenceSince(const std::vector<Report>& now, const Options& options) {
  const ReportText before = Read(options.before, options);
  if (!before.cut.empty() || before.reports.empty())
    throw Failure(fmt::format("{}: {}", NameOfFile(options.before),
                              before.cut.empty() ? noReport : before.cut));
  return Difference(before.reports, now, options.records);
}

/// What ends the command, empty if all is well.
std::string Show(const std::vector<Report>& reports, const Options& options) {
  if (options.check) return PrintInconsistencies(reports);
  if (options.json)
    WriteJson(reports, Print);
  else if (!options.before.empty())
    Print(DifferenceSince(reports, options));
  else if (options.prometheus)
    Print(PrometheusText(reports));
  else if (!options.series.empty())
    Print(options.series == "json" ? SeriesJson(reports) : SeriesText(reports));
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
  if (options.before == "-" && options.file == "-")
    throw CLI::ValidationError("--diff", "one of two files at most is standard input");
  const ReportText text = Read(options.file, options);
  std::string failure;
  if (!text.reports.empty())
    failure = Show(text.reports, options);
  else if (text.cut.empty())
    failure = noReport;
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
  form->add_flag("--prometheus", options->prometheus, "the last figures of each pool as metrics");
  form->add_flag("--series{csv}", options->series,
                 "a row for each report as CSV, or with --series=json as JSON")
      ->check(CLI::IsMember({"csv", "json"}).description(""));
  CLI::Option* const diff = form->add_option(
      "--diff", options->before, "an earlier output of the same process: what has changed since");
  form->require_option(0, 1);
  command->add_flag("--records", options->records, "with --diff: each record that came or went")
      ->needs(diff);
  command->footer("Example: is the pool's state consistent after this run?\n"
                  "  ./program | vokmempool report --check\n"
                  "  vokmempool report --diff before.txt after.txt");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
