// The records of a bucket as a short text, for a page that holds millions: a bit stream, six bits a
// character. tools/picture/records.js reads it.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_RECORDBITS_H
#define VOK_MEMPOOL_TOOLS_PICTURE_RECORDBITS_H

#include "report/Model.h"

#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// Each record with its type and, of a free one, its next offset. A used record is one bit; a free
/// one of n records takes three or four where its next is a neighbour, as in a bucket that was
/// served or given back in order, and otherwise 2 bits and those of n:
///
///     0                 used
///     11 index          free, next is that record; n where the list ends
///     101               free, next is the record behind
///     1001              free, next is the record in front
///     10001 32 bits     free, and next is no record's offset
///     100001            EXT
///     100000            UNKN
std::string RecordBits(const BucketReport& bucket);

/// A flag a record.
std::string FlagBits(const std::vector<bool>& flags);

} // namespace VOK::MemPool::Tools

#endif
