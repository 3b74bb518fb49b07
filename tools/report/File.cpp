#include "report/File.h"

#include "common/Failure.h"
#include "common/Files.h"
#include "report/Json.h"
#include "report/Reader.h"

#include <fmt/format.h>

namespace VOK::MemPool::Tools {

std::vector<Report> ReadReportFile(const std::string& file, bool isJson) {
  const std::string text = Input(file).ReadAll();
  try {
    std::vector<Report> reports = isJson ? ReadJson(text) : ReadReports(text);
    if (reports.empty()) throw Failure("there is no report in it");
    return reports;
  } catch (const Failure& failure) {
    throw Failure(fmt::format("{}: {}", file, failure.what()));
  }
}

} // namespace VOK::MemPool::Tools
