// vokmempool picture: draws detailed reports as one page that a browser opens from a file.
// Test: tests/tools/picture_test.py.
#include "common/Files.h"
#include "common/Tool.h"
#include "picture/Data.h"
#include "report/Formats.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>
#include <memory>

namespace VOK::MemPool::Tools {

namespace {

struct Options {
  std::string report, other, out;
};

bool IsPlain(const Report& report) {
  return report.bucketReports.empty() && !report.buckets.rows.empty();
}

/// The reports of a file that have their records; those that lack them are named on the error
/// stream, or are a failure if there is no other.
PictureSource Read(const std::string& file) {
  const std::string name = NameOfFile(file);
  PictureSource source{ShortNameOfFile(file), {}};
  std::string plain;
  ReportText text = ReadReports(Input(file).ReadAll());
  if (!text.cut.empty() || text.reports.empty())
    throw Failure(
        fmt::format("{}: {}", name, text.cut.empty() ? "there is no report in it" : text.cut));
  for (Report& report : text.reports)
    if (IsPlain(report))
      plain += fmt::format("{}: line {}: a plain report, which has no records to draw\n", name,
                           report.line);
    else
      source.reports.push_back(std::move(report));
  if (source.reports.empty())
    throw Failure(plain.substr(0, plain.find('\n')) + "; DbgDetailed writes them");
  for (std::size_t at = 0; at < plain.size(); at = plain.find('\n', at) + 1)
    fmt::print(stderr, "vokmempool: {}\n", plain.substr(at, plain.find('\n', at) - at));
  return source;
}

void Run(const Options& options) {
  const PictureSource report = Read(options.report);
  WriteFile(options.out, FillPage(picturePage, options.other.empty()
                                                   ? PictureData(nullptr, report)
                                                   : PictureData(&report, Read(options.other))));
}

} // namespace

void AddPicture(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command =
      app.add_subcommand("picture", "Draws detailed reports as a page for the browser");
  command->add_option("REPORT", options->report, "the output to read, - for standard input")
      ->required();
  command->add_option("OTHER", options->other, "a later output of the same process, to compare");
  command->add_option("-o,--output", options->out, "the page to write, - for standard output")
      ->required();
  command->footer("Example: where do the records lie, and what has changed since?\n"
                  "  ./program > out.txt; vokmempool picture out.txt -o pools.html\n"
                  "  vokmempool picture before.txt after.txt -o change.html");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
