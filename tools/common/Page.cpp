#include "common/Page.h"

namespace VOK::MemPool::Tools {

std::string FillPage(const Page& page, const nlohmann::ordered_json& data) {
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
