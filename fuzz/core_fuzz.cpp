// Hostile core files for the reader of pools: it ends, and what it shows of a damaged pool is a
// report that can be written, checked and summarised.
#include "Target.h"
#include "common/Tool.h"
#include "inspect/Pools.h"
#include "report/Check.h"
#include "report/Formats.h"
#include "report/Summary.h"

#include <vector>

using namespace VOK::MemPool::Tools;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::vector<char> content(data, data + size);
  try {
    std::vector<Report> reports;
    for (Pool& pool : ReadPools(MemoryOfCore(content.data(), content.size()), true).all)
      reports.push_back(std::move(pool.report));
    for (const Report& report : reports) {
      WriteReport(report);
      CheckReport(report);
    }
    WriteJson(reports, [](std::string_view) {});
    Summarise(reports);
  } catch (const Failure&) { // there is nothing to read
  }
  return 0;
}
