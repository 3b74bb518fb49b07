// Hostile text for the reader of reports: what it takes, it gives back byte for byte, by way of
// JSON too, and draws it; all else it refuses. A text that starts with a brace is taken for a
// document.
#include "Failure.h"
#include "PictureData.h"
#include "ReportCheck.h"
#include "ReportJson.h"
#include "ReportReader.h"
#include "ReportSummary.h"
#include "ReportWriter.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

using namespace VOK::MemPool::Tools;

namespace {

std::string TextOf(const std::vector<Report>& reports) {
  std::string text;
  for (const Report& report : reports)
    text += WriteReport(report);
  return text;
}

void Demand(bool condition) {
  if (!condition) std::abort();
}

void ReadText(const std::string& input) {
  const std::vector<Report> reports = ReadReports(input);
  for (const Report& report : reports) {
    Demand(input.find(WriteReport(report)) != std::string::npos);
    CheckReport(report);
  }
  Demand(!Summarise(reports).empty());
  const PictureSource source{"fuzz", reports};
  Demand(PictureData(&source, source).find('<') == std::string::npos);
  std::string json;
  WriteJson(reports, [&](std::string_view piece) { json += piece; });
  Demand(TextOf(ReadJson(json)) == TextOf(reports));
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string input(reinterpret_cast<const char*>(data), size);
  try {
    if (input.starts_with('{'))
      CheckReport(ReadJson(input).at(0));
    else
      ReadText(input);
  } catch (const Failure&) {
  } catch (const std::out_of_range&) { // a document of no report
  }
  return 0;
}
