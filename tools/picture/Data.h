// What a picture's page shows, as one JSON document: the pools of a text, and how they differ from
// those of an earlier one; and the page around it.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_DATA_H
#define VOK_MEMPOOL_TOOLS_PICTURE_DATA_H

#include "common/Page.h"
#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct PictureSource {
  std::string name;
  std::vector<Report> reports;
};

/// `before` may be null.
nlohmann::ordered_json PictureData(const PictureSource* before, const PictureSource& now);

extern const Page picturePage;

} // namespace VOK::MemPool::Tools

#endif
