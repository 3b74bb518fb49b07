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
#include "Target.h"

#include <cstdlib>
#include <string>

using namespace VOK::MemPool::Tools;

namespace {

void ReadText(const std::string& input) {
  const std::vector<Report> reports = ReadReports(input);
  std::string json;
  WriteJson(reports, [&](std::string_view piece) { json += piece; });
  const std::vector<Report> again = ReadJson(json);
  bool isSame = again.size() == reports.size();
  for (std::size_t i = 0; isSame && i < reports.size(); ++i) {
    const std::string text = WriteReport(reports[i]);
    isSame = input.find(text) != std::string::npos && WriteReport(again[i]) == text;
    CheckReport(reports[i]);
  }
  Summarise(reports);
  const PictureSource source{"fuzz", reports};
  if (!isSame || PictureData(&source, source).find('<') != std::string::npos) std::abort();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string input(reinterpret_cast<const char*>(data), size);
  try {
    if (!input.starts_with('{'))
      ReadText(input);
    else
      for (const Report& report : ReadJson(input))
        CheckReport(report);
  } catch (const Failure&) { // the text is refused
  }
  return 0;
}
