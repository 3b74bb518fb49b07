#include "report/FixedLines.h"

#include <fmt/format.h>

namespace VOK::MemPool::Tools {

std::string HeadingLine(std::span<const Column> columns) {
  std::string line(tableIndent);
  for (const Column& column : columns)
    line += fmt::format("{:<{}} ", column.title, column.width);
  return line;
}

std::string RuleLine(std::span<const Column> columns) {
  std::string line(tableIndent);
  for (const Column& column : columns)
    line += fmt::format("{:=>{}} ", "", column.width);
  return line;
}

std::string MapHeading(std::size_t columns) {
  std::string line(6, ' ');
  for (std::size_t i = 1; i <= columns; ++i)
    line += fmt::format("    {}     ", i);
  return line;
}

std::string MapRule(std::size_t boxes) {
  std::string line = "     +";
  for (std::size_t i = 0; i < boxes; ++i)
    line += "---------+";
  return line;
}

std::string BucketMark(Number number) {
  return fmt::format("{}{}{:03}", titleIndent, BucketTitle::bucket, number);
}

std::string AddressText(Address address) {
  return fmt::format("{:>8}", address.value == 0 ? "0" : fmt::format("{:#x}", address.value));
}

const char* TypeText(Type type) {
  switch (type) {
  case Type::Free:
    return TypeName::free;
  case Type::Used:
    return TypeName::used;
  case Type::Ext:
    return TypeName::ext;
  case Type::Unknown:
    break;
  }
  return TypeName::unknown;
}

} // namespace VOK::MemPool::Tools
