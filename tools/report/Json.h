// Reports as a JSON document, and back. docs/report-json.md documents the form.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_JSON_H
#define VOK_MEMPOOL_TOOLS_REPORT_JSON_H

#include "report/Model.h"

#include <functional>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

/// Ends the second key of a text that is no UTF-8, which has its bytes.
inline constexpr const char* textBytes = "Bytes";

/// Writes the document in pieces, one per bucket.
void WriteJson(const std::vector<Report>& reports,
               const std::function<void(std::string_view)>& write);

/// The reports of a document, with the line numbers of the text that they make together. A Failure
/// says what is wrong with a document of another form.
std::vector<Report> ReadJson(std::string_view document);

} // namespace VOK::MemPool::Tools

#endif
