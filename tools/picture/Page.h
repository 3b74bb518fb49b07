// The page of a picture without its data. The build makes the source from tools/picture/.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_PAGE_H
#define VOK_MEMPOOL_TOOLS_PICTURE_PAGE_H

#include <string_view>

namespace VOK::MemPool::Tools {

extern const std::string_view pageStart; ///< up to the data
extern const std::string_view pageEnd;   ///< from behind them

} // namespace VOK::MemPool::Tools

#endif
