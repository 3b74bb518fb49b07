// The records of a bucket as a short text, for a page that holds millions: a bit stream, six bits
// per character. tools/picture/data.js reads it. Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_RECORDBITS_H
#define VOK_MEMPOOL_TOOLS_PICTURE_RECORDBITS_H

#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// Each record's type and, of a free one, its next offset. A used record takes one bit. A free one
/// of n records takes three or four if its next is a neighbour, as in a bucket that was allocated
/// or freed in order, and otherwise 2 bits and those of n:
///
///     0                 used
///     11 index          free, next is that record; n at the end of the list
///     101               free, next is the record after it
///     1001              free, next is the record before it
///     10001 32 bits     free, and next is no record's offset
///     100001            EXT
///     100000            UNKN
std::string RecordBits(const BucketReport& bucket);

/// One bit per flag.
std::string FlagBits(const std::vector<bool>& flags);

} // namespace VOK::MemPool::Tools

#endif
