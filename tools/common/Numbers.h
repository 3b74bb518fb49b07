// Numbers as arguments of a subcommand.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_NUMBERS_H
#define VOK_MEMPOOL_TOOLS_COMMON_NUMBERS_H

#include <CLI/CLI.hpp>
#include <charconv>
#include <fmt/format.h>
#include <string>
#include <system_error>

namespace VOK::MemPool::Tools {

/// Refuses anything else, and says what the number is of.
template <class Number>
CLI::Validator NumberFrom(Number least, Number most, const char* what) {
  const auto check = [=](const std::string& text) {
    Number number{};
    const char* const end = text.data() + text.size();
    const auto result = std::from_chars(text.data(), end, number);
    if (result.ec == std::errc() && result.ptr == end && number >= least && number <= most)
      return std::string();
    return fmt::format("takes {}, from {} to {}, and not {}", what, least, most, text);
  };
  return {check, ""};
}

} // namespace VOK::MemPool::Tools

#endif
