// Reports as the text that the library prints, and as a JSON document. What is read is written
// again to the byte. Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_FORMATS_H
#define VOK_MEMPOOL_TOOLS_REPORT_FORMATS_H

#include "report/Model.h"

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// The whole reports of a text or a document.
struct ReportText {
  std::vector<Report> reports;
  std::string cut; ///< why the next one isn't whole; empty if all are
};

/// The reports of a text, in its order, up to the first that isn't whole; other lines are skipped.
/// Each line of a report has to match to the column.
ReportText ReadReports(std::string_view text);

/// What a lenient reading passes over.
struct PassedOver {
  std::size_t lines = 0, firstLine = 0; ///< lines of others within a report, and the first
  std::size_t prefixes = 0;             ///< lines with what a log puts before each
  std::size_t blanks = 0;               ///< lines without the blanks at their end
  std::size_t lineEnds = 0;             ///< lines that end as on Windows

  /// All of it in one line, empty for nothing.
  std::string Say() const;
};

/// The same of a text that went through a log, a mail or an editor. It goes on after a report that
/// isn't whole. A report has the line of its title, and counts its own lines from there.
ReportText ReadReportsLeniently(std::string_view text, PassedOver& passed);

std::string WriteReport(const Report& report);

/// Ends the second key of a text that is no UTF-8, which has its bytes.
inline constexpr const char* textBytes = "Bytes";

/// The reports of a document, with the line numbers of the text that they make together; none of a
/// document of another form.
ReportText ReadJson(std::string_view document);

/// Writes the document in pieces, one per bucket.
void WriteJson(const std::vector<Report>& reports,
               const std::function<void(std::string_view)>& write);

} // namespace VOK::MemPool::Tools

#endif
