// The primitives of all reports.
// Test: tests/report_test.cpp.
#include "diagnostics/ReportText.h"

#include "base/PointerText.h"

#include <cassert>

namespace VOK::MemPool {

std::string Indent(std::uint32_t depth) { return std::string(std::size_t{3} * depth, ' '); }

// Formed by hand: a private stream takes 3,700 instructions (callgrind over bench/report, g++ 12),
// more than the rest of a table's row. Under width 8 the stream fills in front, and it writes a
// null pointer, and no other, without the "0x".
std::string PtrText(const void* p) {
  std::string text = BarePtrText(p).text;
  if (p != nullptr) text.insert(0, "0x");
  if (text.size() < 8) text.insert(0, 8 - text.size(), ' ');
  return text;
}

void HeaderText(std::ostream& os, const std::string& indent, const char* label,
                const std::string& text) {
  os << indent << label << text << std::endl;
}

void ZeroFilled(std::ostream& os, int width, std::uint32_t number) {
  os.fill('0');
  os.width(width);
  os << number;
  os.fill(' ');
}

Table::Table(std::ostream& os_, std::uint32_t depth, std::span<const Column> columns_)
    : os(os_), indent(Indent(depth)), columns(columns_) {
  os << std::left;
  Row();
  for (const Column& column : columns)
    Cell(column.title);
  End();

  os << std::right;
  os.fill('=');
  Row();
  for (std::size_t i = 0; i < columns.size(); ++i)
    Cell("=");
  End();
  os.fill(' ');
}

Table& Table::Row() {
  next = 0;
  os << indent;
  return *this;
}

Table& Table::Id(std::uint32_t number) {
  ZeroFilled(os, NextWidth(), number);
  os.put(' ');
  return *this;
}

Table& Table::Percent(double number) {
  os.width(NextWidth() - 1);
  os << std::fixed;
  os.precision(3);
  os << number;
  return Text("% ");
}

Table& Table::Bar(std::uint32_t stars) {
  NextWidth(); // a bar has the length of its number
  os.width(static_cast<std::streamsize>(stars));
  os.fill('*');
  os << "*";
  os.fill(' ');
  return *this;
}

Table& Table::Text(const char* text) {
  os << text;
  return *this;
}

void Table::End() {
  assert(next == columns.size());
  os << std::endl;
}

int Table::NextWidth() {
  assert(next < columns.size());
  return columns[next++].width;
}

} // namespace VOK::MemPool
