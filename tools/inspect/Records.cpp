// A bucket's report, by the same walks as the library's own.
#include "inspect/Walk.h"
#include "report/Form.h"

#include <algorithm>
#include <utility>

namespace VOK::MemPool::Tools {

Records::Records(const Library& library_, const Structure& header_, std::optional<Structure> area_)
    : library(library_), structures(library.layout.structures), header(header_),
      area(std::move(area_)), recsSize(header.Get<std::uint16_t>(structures.bucket.recsSize)),
      recSize(header.Get<std::uint16_t>(structures.bucket.recSize)),
      freeHead(header.Get<std::uint16_t>(structures.bucket.freeHead)),
      freeRecs(header.Get<std::uint16_t>(structures.bucket.freeRecs)),
      totalRecs(recSize == 0 || recsSize < 2 ? 0 : (recsSize - 2) / recSize) {}

/// Calls `visit` with each record in the order of addresses, with a piece at the end, too.
template <class Visitor>
void Records::ForEach(Visitor visit) const {
  if (!area || recSize == 0 || recsSize < 2) return;
  Number offset = 2;
  do {
    visit(RecordAt(offset));
    offset += recSize;
  } while (offset < recsSize);
}

Records::Record Records::RecordAt(Number offset) const {
  const auto byte = [&](std::uint32_t distance) -> Number {
    return offset + distance < recsSize ? area->Get<std::uint8_t>(offset + distance) : 255;
  };
  const Number type = byte(structures.rec.type);
  return {offset, byte(structures.rec.offsetLow) | byte(structures.rec.offsetHigh) << 8,
          type <= 2 ? static_cast<Type>(type) : Type::Unknown};
}

bool Records::HoldsHeader(Number offset) const {
  return area && offset >= 2 && offset + structures.rec.size <= recsSize;
}

Address Records::AddressOf(Number offset) const {
  return {library.Sum(header.address, structures.bucket.freeRecs + offset)};
}

Number Records::CountUsed() const {
  Number used = 0;
  ForEach([&](const Record& record) { used += record.type == Type::Used ? 1 : 0; });
  return used;
}

void Records::Describe(BucketReport& bucket) const {
  const auto pointer = [&](std::uint32_t offset) { return Address{header.GetPointer(offset)}; };
  const Number usedRecs = totalRecs - freeRecs;
  const Number dataSize = recSize - structures.rec.size;
  bucket.addr = {header.address};
  bucket.sizeofBucket = bucket.headerOffset = structures.bucket.size;
  bucket.parent = pointer(structures.bucket.parent);
  bucket.next1 = pointer(structures.bucket.next1);
  bucket.prev1 = pointer(structures.bucket.prev1);
  bucket.next2 = pointer(structures.bucket.next2);
  bucket.prev2 = pointer(structures.bucket.prev2);
  bucket.recsBase = AddressOf(0);
  bucket.recsBeg = AddressOf(2);
  bucket.recsEnd = AddressOf(recsSize);
  bucket.recSize = recSize;
  bucket.recsSize = recsSize;
  bucket.totalRecs = bucket.records.count = bucket.map.count = totalRecs;
  bucket.usedRecs = bucket.histogram.count = usedRecs;
  bucket.usedBytes = dataSize * usedRecs;
  bucket.freeRecs = bucket.freeList.count = freeRecs;
  bucket.freeBytes = dataSize * freeRecs;
  bucket.freeHead = freeHead;
  DescribeRecords(bucket);
  if (const Number used = CountUsed(); used > 0)
    bucket.histogram.rows = {
        {{1}, dataSize, used, {std::min(used, maxStars / 2), used > maxStars / 2}}};
  DescribeMap(bucket.map);
  DescribeFreeList(bucket);
}

void Records::DescribeRecords(BucketReport& bucket) const {
  Number id = 0;
  ForEach([&](const Record& record) {
    const Number dataSize = record.type == Type::Used ? recSize - structures.rec.size : 0;
    bucket.records.rows.push_back({{++id},
                                   record.type,
                                   record.offset,
                                   recSize,
                                   record.offset + recSize,
                                   dataSize,
                                   AddressOf(record.offset)});
  });
}

void Records::DescribeMap(Map& map) const {
  ForEach([&](const Record& record) {
    map.columns = std::min<Number>(map.columns + 1, Map::boxesPerRow);
    if (map.boxes.size() == totalRecs) return;
    if (map.boxes.size() % Map::boxesPerRow == 0)
      map.labels.push_back(static_cast<Number>(map.boxes.size()));
    const auto [tag, number] = record.type == Type::Free ? std::pair('n', record.link)
                               : record.type == Type::Used
                                   ? std::pair('d', recSize - structures.rec.size)
                                   : std::pair('u', Number{0});
    map.boxes.push_back(
        {record.type, record.offset == freeHead, tag, record.offset, recSize, number});
  });
}

void Records::DescribeFreeList(BucketReport& bucket) const {
  Number count = 0;
  for (Number offset = freeHead; HoldsHeader(offset) && count <= totalRecs + 1;) {
    const Number next = RecordAt(offset).link;
    bucket.freeList.rows.push_back({{++count},
                                    offset,
                                    next,
                                    recSize,
                                    AddressOf(offset),
                                    next != 0 ? AddressOf(next) : Address{}});
    offset = next;
  }
}

} // namespace VOK::MemPool::Tools
