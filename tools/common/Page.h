// A page for the browser, which loads nothing else, around the data that it shows.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_PAGE_H
#define VOK_MEMPOOL_TOOLS_COMMON_PAGE_H

#include <nlohmann/json.hpp>
#include <string>
#include <string_view>

namespace VOK::MemPool::Tools {

/// The build makes the source of each page from the page's files.
struct Page {
  std::string_view start; ///< up to the data
  std::string_view end;   ///< from the end of the data
};

/// The page with its data, whose texts need not be valid UTF-8.
inline std::string FillPage(const Page& page, const nlohmann::ordered_json& data) {
  using Json = nlohmann::ordered_json;
  std::string filled(page.start);
  for (const char c : data.dump(-1, ' ', false, Json::error_handler_t::replace))
    if (c == '<')
      filled += "\\u003c"; // a text must not end the script element
    else
      filled += c;
  return filled.append(page.end);
}

} // namespace VOK::MemPool::Tools

#endif
