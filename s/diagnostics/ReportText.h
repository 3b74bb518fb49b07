// What all reports are made of: indentation, the text of an address, the lines of a header block,
// and the rows of a table, whose columns are declared once. A report leaves its marks on the
// stream's format state and restores nothing; the state it starts under is part of its text.
// Test: tests/report_test.cpp.
#ifndef VOK_MEMPOOL_REPORTTEXT_H
#define VOK_MEMPOOL_REPORTTEXT_H

#include "diagnostics/ReportLayout.h"

#include <cstddef>
#include <cstdint>
#include <ostream>
#include <span>
#include <string>

namespace VOK::MemPool {

/// Three spaces for each step of depth.
std::string Indent(std::uint32_t depth);

/// The text of a pointer as the standard library's stream writes it under width 8 in the classic
/// locale, its leading "0x" included. A test compares the two.
std::string PtrText(const void* p);

/// A header block line with a number: `label` is 12 characters of name, a colon and a blank.
template <class Number>
void HeaderNumber(std::ostream& os, const std::string& indent, const char* label, Number number) {
  os << indent << label;
  os.width(8);
  os << number << std::endl;
}

/// A header block line with a text.
void HeaderText(std::ostream& os, const std::string& indent, const char* label,
                const std::string& text);

/// A number filled in front with zeros. The stream's fill is a blank afterwards.
void ZeroFilled(std::ostream& os, int width, std::uint32_t number);

/// A table under its heading. A data row is Row(), one call a cell from left to right, End(); each
/// cell takes the width of its column, and a longer value is written whole.
class Table {
public:
  /// Writes the heading and the rule row at `depth`. The columns must outlive the table.
  Table(std::ostream& os, std::uint32_t depth, std::span<const Column> columns);

  Table& Row();

  /// A cell followed by the separator.
  template <class Value>
  Table& Cell(const Value& value) {
    LastCell(value);
    os.put(' ');
    return *this;
  }

  /// A cell with no separator.
  template <class Value>
  Table& LastCell(const Value& value) {
    os.width(NextWidth());
    os << value;
    return *this;
  }

  /// A cell of spaces.
  Table& Blank() { return Cell(" "); }

  /// A zero-filled number in a cell.
  Table& Id(std::uint32_t number);

  /// A number with three decimals, closed by "%" within the column.
  Table& Percent(double number);

  /// `stars` stars in place of a cell. REQUIRES: at least one.
  Table& Bar(std::uint32_t stars);

  /// A text right after what the row has.
  Table& Text(const char* text);

  /// Ends the row. REQUIRES: it has a cell in each column.
  void End();

private:
  int NextWidth();

  std::ostream& os;
  const std::string indent;
  const std::span<const Column> columns;
  std::size_t next = 0;
};

} // namespace VOK::MemPool

#endif
