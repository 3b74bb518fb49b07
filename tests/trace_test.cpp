#include "support/Process.h"

#include "diagnostics/ReportText.h"
#include "services/Trace.h"

#include <gtest/gtest.h>
#include <iomanip>
#include <optional>
#include <sstream>

using namespace VOK::MemPool;

namespace {

// What a private stream of the platform writes in the classic locale: in a trace line without a
// leading 0x, in a report under width 8.
TEST(Trace, PointersAreTheStreams) {
  std::vector<std::uintptr_t> values{0, 0xF, 0x0AB0, 0xABCDEF, 0x12345678, UINTPTR_MAX};
  for (unsigned bit = 0; bit < 8 * sizeof(void*); ++bit)
    values.push_back(std::uintptr_t{1} << bit);
  std::optional<GroupingLocale> locale;
  for (const bool grouping : {false, true}) {
    if (grouping) locale.emplace();
    for (const std::uintptr_t value : values) {
      const auto* const p = reinterpret_cast<const void*>(value);
      std::stringstream stream;
      stream.imbue(std::locale::classic());
      stream << std::hex << p;
      const std::string text = stream.str();
      EXPECT_EQ(BarePtrText(p).text, text.substr(text.starts_with("0x") ? 2 : 0)) << grouping;
      stream.str("");
      stream << std::setw(8) << p;
      EXPECT_EQ(PtrText(p), stream.str()) << grouping;
    }
  }
}

} // namespace
