// The words and widths of all reports, each once: titles, labels of the header blocks, columns of
// the tables. What writes a report and what reads one back take them from here.
// Test: tests/report_test.cpp.
#ifndef VOK_MEMPOOL_REPORTLAYOUT_H
#define VOK_MEMPOOL_REPORTLAYOUT_H

namespace VOK::MemPool {

struct Column {
  const char* title;
  int width;
};

namespace PoolTitle {
inline constexpr const char* pool = "MemPool::Mgr ";
inline constexpr const char* histogram = "USED DATA FREQ DIST HISTOGRAM (";
inline constexpr const char* buckets = "BUCKETS (";
inline constexpr const char* freeBuckets = "FREE BUCKETS (";
inline constexpr const char* extRecs = "EXT RECS (";
} // namespace PoolTitle

namespace PoolLabel {
inline constexpr const char* version = "Version     : ";
inline constexpr const char* addr = "Addr        : ";
inline constexpr const char* sizeofPool = "Sizeof      : ";
inline constexpr const char* bucketSize = "Bucket Size : ";
inline constexpr const char* numGroups = "Num Groups  : ";
inline constexpr const char* numBuckets = "Num Buckets : ";
inline constexpr const char* empty = "   Empty    : ";
inline constexpr const char* full = "   Full     : ";
inline constexpr const char* usedRecs = "Used Recs   : ";
inline constexpr const char* extRecs = "Ext Recs    : ";
inline constexpr const char* freeRecs = "Free Recs   : ";
inline constexpr const char* freeBucks = "Free Bucks  : ";
inline constexpr const char* freeBucksM = "Free BucksM : ";
inline constexpr const char* enabled = "Enabled     : ";
inline constexpr const char* maxExtSize = "Max Ext Sz  : ";
inline constexpr const char* minBucketSize = "Min Buck Sz : ";
inline constexpr const char* maxBucketSize = "Max Buck Sz : ";
inline constexpr const char* minRecSize = "Min Rec Sz  : ";
inline constexpr const char* maxRecSize = "Max Rec Sz  : ";
inline constexpr const char* dataAlignment = "Data Align  : ";
inline constexpr const char* sizeofBucket = "Sizeof Buck : ";
inline constexpr const char* sizeofHeader = "Sizeof Hdr  : ";
inline constexpr const char* sizeofFree = "Sizeof Free : ";
inline constexpr const char* sizeofUsed = "Sizeof Used : ";
} // namespace PoolLabel

namespace PoolColumns {
inline constexpr Column histogram[] = {{"Id", 5}, {"Size", 7}, {"Freq", 9}, {"Magnitude", 50}};
inline constexpr Column buckets[] = {{"Id", 5},    {"Group", 5},  {"Used", 5},     {"Free", 5},
                                     {"Total", 5}, {"% Used", 8}, {"Rec Size", 8}, {"Addr", 8}};
inline constexpr Column freeBuckets[] = {{"Id", 5},    {"Group", 5}, {"Size", 5},
                                         {"Count", 5}, {"Off", 5},   {"Buckets", 8}};
inline constexpr Column extRecs[] = {{"Id", 5},       {"Length", 7}, {"Data Ptr", 8},
                                     {"Heap Ptr", 8}, {"Next", 8},   {"Prev", 8}};
} // namespace PoolColumns

/// The smallest bucket size that is worth a pool: a printed figure, nothing tests it.
inline constexpr unsigned minBucketSize = 128;

namespace BucketTitle {
inline constexpr const char* bucket = "MemPool::Bucket #";
inline constexpr const char* records = " ALL RECORDS (";
inline constexpr const char* histogram = " USED DATA FREQ DIST HISTOGRAM (";
inline constexpr const char* map = " ALL RECORDS MAP (";
inline constexpr const char* freeList = " FREE LIST (";
} // namespace BucketTitle

namespace BucketLabel {
inline constexpr const char* addr = "Addr        : ";
inline constexpr const char* sizeofBucket = "Sizeof      : ";
inline constexpr const char* parent = "Parent      : ";
inline constexpr const char* next1 = "Next1       : ";
inline constexpr const char* prev1 = "Prev1       : ";
inline constexpr const char* next2 = "Next2       : ";
inline constexpr const char* prev2 = "Prev2       : ";
inline constexpr const char* recsBase = "Recs Base   : ";
inline constexpr const char* recsBeg = "Recs Beg    : ";
inline constexpr const char* recsEnd = "Recs End    : ";
inline constexpr const char* recSize = "Recs Size   : ";
inline constexpr const char* recsSize = "Size        : ";
inline constexpr const char* totalRecs = "Total Recs  : ";
inline constexpr const char* usedRecs = "Used Recs   : ";
inline constexpr const char* usedBytes = "Used Bytes  : ";
inline constexpr const char* freeRecs = "Free Recs   : ";
inline constexpr const char* freeBytes = "Free Bytes  : ";
inline constexpr const char* freeHead = "Free Head   : ";
inline constexpr const char* headerOffset = "Hdr Offset  : ";
} // namespace BucketLabel

namespace BucketColumns {
inline constexpr Column records[] = {{"Id", 5},  {"Type", 4},  {"Offset", 6},  {"Size", 5},
                                     {"End", 5}, {"DSize", 5}, {"Address", 18}};
inline constexpr Column histogram[] = {{"Id", 5}, {"Size", 5}, {"Freq", 5}, {"Magnitude", 50}};
inline constexpr Column freeList[] = {{"Id", 5},   {"Offset", 6},   {"Next", 5},
                                      {"Size", 5}, {"Address", 18}, {"Next Addr", 18}};
} // namespace BucketColumns

/// What a record's type byte is called.
namespace TypeName {
inline constexpr const char* free = "FREE";
inline constexpr const char* used = "USED";
inline constexpr const char* ext = "EXT";
inline constexpr const char* unknown = "UNKN";
} // namespace TypeName

} // namespace VOK::MemPool

#endif
