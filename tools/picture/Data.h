// What a picture's page shows, as one JSON document: the pools of a text, and how they differ from
// those of an earlier one.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_DATA_H
#define VOK_MEMPOOL_TOOLS_PICTURE_DATA_H

#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

struct PictureSource {
  std::string name;
  std::vector<Report> reports;
};

/// `before` may be null. The text may stand within a script element of a page.
std::string PictureData(const PictureSource* before, const PictureSource& now);

} // namespace VOK::MemPool::Tools

#endif
