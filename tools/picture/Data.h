// What a picture's page shows, as one JSON document: the pools of a text, and how they differ from
// those of an earlier one; and the page around it.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_DATA_H
#define VOK_MEMPOOL_TOOLS_PICTURE_DATA_H

#include "report/Model.h"

#include <string>
#include <string_view>
#include <vector>

namespace VOK::MemPool::Tools {

struct PictureSource {
  std::string name;
  std::vector<Report> reports;
};

/// `before` may be null. The text is safe within a script element of a page.
std::string PictureData(const PictureSource* before, const PictureSource& now);

// The page without its data. The build makes the source of these from the page's files.
extern const std::string_view pageStart; ///< up to the data
extern const std::string_view pageEnd;   ///< from the end of the data

} // namespace VOK::MemPool::Tools

#endif
