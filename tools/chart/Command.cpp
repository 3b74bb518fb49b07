// vokmempool chart: draws the pools over time as one page that a browser opens from a file.
// Test: tests/tools/chart_test.py.
#include "chart/Series.h"
#include "common/Files.h"
#include "common/Page.h"
#include "common/Tool.h"
#include "report/Formats.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>
#include <memory>

namespace VOK::MemPool::Tools {

extern const Page chartPage;

namespace {

struct Options {
  std::string file = "-", out;
};

Series SeriesOfTrace(std::string_view text) {
  TraceLedger ledger;
  History history;
  LineNumber line = 0;
  while (!text.empty()) {
    ++line;
    const std::size_t end = text.find('\n');
    TraceEvent event;
    if (end != std::string_view::npos &&
        ReadTraceLine(text.substr(0, end), event) == LineKind::Event) {
      ledger.Take(line, event);
      history.Sample(line, ledger);
    }
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  }
  return SeriesOf(history.GetSnapshots(line, ledger), {});
}

nlohmann::ordered_json DataOf(const Series& series, const std::string& source) {
  nlohmann::ordered_json data = {{"source", source}, {"lines", series.lines}};
  auto& pools = data["pools"] = nlohmann::ordered_json::array();
  for (const PoolSeries& pool : series.pools) {
    auto points = nlohmann::ordered_json::array();
    for (const PoolSeries::Point& point : pool.points) {
      const nlohmann::ordered_json held =
          point.held ? nlohmann::ordered_json(*point.held) : nullptr;
      points.push_back({point.place, held, point.payload});
    }
    pools.push_back({{"name", pool.name}, {"points", std::move(points)}});
  }
  return data;
}

void Run(const Options& options) {
  const std::string text = Input(options.file).ReadAll();
  const std::string name = NameOfFile(options.file);
  const ReportText found = ReadReports(text);
  if (!found.cut.empty()) throw Failure(fmt::format("{}: {}", name, found.cut));
  const Series series = found.reports.empty() ? SeriesOfTrace(text) : SeriesOf(found.reports);
  if (series.pools.empty())
    throw Failure(fmt::format("{}: there is neither a report nor a trace line in it", name));
  WriteFile(options.out, FillPage(chartPage, DataOf(series, ShortNameOfFile(options.file))));
}

} // namespace

void AddChart(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command =
      app.add_subcommand("chart", "Draws the pools over time as a page for the browser");
  command->add_option("FILE", options->file,
                      "an output with several reports of each pool, or with trace lines; - for "
                      "standard input");
  command->add_option("-o,--output", options->out, "the page to write, - for standard output")
      ->required();
  command->footer("Example: which pool grows?\n"
                  "  ./program > out.txt; vokmempool chart out.txt -o growth.html");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
