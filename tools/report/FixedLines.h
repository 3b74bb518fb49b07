// The lines of a report that hold no value, and the texts of a value that stand apart from a cell.
#ifndef VOK_MEMPOOL_TOOLS_REPORT_FIXEDLINES_H
#define VOK_MEMPOOL_TOOLS_REPORT_FIXEDLINES_H

#include "diagnostics/ReportLayout.h"
#include "report/Model.h"

#include <cstddef>
#include <span>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

// A report stands at depth 0, so its indentations are fixed.
inline constexpr std::string_view headerIndent = "   ";
inline constexpr std::string_view titleIndent = "   ";
inline constexpr std::string_view histogramIndent = "         "; // of the pool's histogram title
inline constexpr std::string_view tableIndent = "      ";
inline constexpr std::string_view bucketIndent = "      "; // of a bucket's header block

inline constexpr std::string_view mapMargin = "     | ";
inline constexpr std::string_view wall = "| ";

/// What a warning begins with; the number of its source line follows in a field of five.
inline constexpr std::string_view warningStart = "WARNING:../s/MemPool:";
inline constexpr int warningWidth = 5;

std::string HeadingLine(std::span<const Column> columns);
std::string RuleLine(std::span<const Column> columns);
std::string MapHeading(std::size_t columns);
std::string MapRule(std::size_t boxes);

/// What a bucket's titles begin with.
std::string BucketMark(Number number);

/// An address as a report shows it: filled to eight characters in front.
std::string AddressText(Address address);

const char* TypeText(Type type);

} // namespace VOK::MemPool::Tools

#endif
