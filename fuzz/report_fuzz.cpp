// Hostile text for the reader of reports: it writes each accepted text again byte for byte, also
// through JSON, and draws it; it refuses all others, and reads any text leniently. A text that
// starts with a brace is read as a document.
#include "Target.h"
#include "chart/Series.h"
#include "picture/Data.h"
#include "report/Check.h"
#include "report/Formats.h"
#include "report/Summary.h"

#include <cstdlib>
#include <string>

using namespace VOK::MemPool::Tools;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string input(reinterpret_cast<const char*>(data), size);
  const bool isText = !input.starts_with('{');
  const std::vector<Report> reports = (isText ? ReadReports(input) : ReadJson(input)).reports;
  std::string json;
  WriteJson(reports, [&](std::string_view piece) { json += piece; });
  const std::vector<Report> again = ReadJson(json).reports;
  if (again.size() != reports.size()) std::abort();
  for (std::size_t i = 0; i < reports.size(); ++i) {
    const std::string text = WriteReport(reports[i]);
    if (WriteReport(again[i]) != text || (isText && input.find(text) == std::string_view::npos))
      std::abort();
    CheckReport(reports[i]);
  }
  Summarise(reports);
  PrometheusText(reports);
  SeriesText(reports);
  SeriesOf(reports);
  const PictureSource source{"fuzz", reports};
  const std::string page = FillPage({"", ""}, PictureData(&source, source));
  if (page.find('<') != std::string::npos) std::abort();
  PassedOver passed;
  const std::vector<Report> lenient = ReadReportsLeniently(input, passed).reports;
  Difference(lenient, reports, true);
  return 0;
}
