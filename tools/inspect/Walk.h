// The walk over one pool in the memory of another process.
#ifndef VOK_MEMPOOL_TOOLS_INSPECT_WALK_H
#define VOK_MEMPOOL_TOOLS_INSPECT_WALK_H

#include "inspect/Library.h"
#include "inspect/Pools.h"

#include <fmt/format.h>
#include <map>
#include <string_view>

namespace VOK::MemPool::Tools {

/// What a walk has visited. No two structures of a pool share a byte, so a link that leads to one
/// that was visited, or into it, is damaged, and each walk ends.
class Visits {
public:
  explicit Visits(const Library& library_) : library(library_) {}

  std::vector<std::string> damages;

  template <class... Args>
  void Damage(fmt::format_string<Args...> format, Args&&... args) {
    damages.push_back(fmt::format(format, std::forward<Args>(args)...));
  }

  /// A copy of the structure that a link leads to; nothing, and a damage, if there can't be one.
  std::optional<Structure> Visit(std::string_view what, std::uint64_t address, std::uint32_t size);

private:
  const Library& library;
  std::map<std::uint64_t, std::uint64_t> visited; ///< from the begin of each piece to its end
};

/// The pool at an address.
Pool WalkPool(const Library& library, std::uint64_t pool, const std::string& name, bool detailed);

/// The records of a bucket as its header and its bytes have them.
class Records {
public:
  /// The bytes from the point from which offsets count to the end; none if they can't be read.
  Records(const Library& library, const Structure& header, std::optional<Structure> area);

  /// How many records of type Used there are.
  Number CountUsed() const;

  void Describe(BucketReport& bucket) const;

private:
  struct Record {
    Number offset, link; ///< `link` is the number in the record's own header
    Type type;
  };

  Record RecordAt(Number offset) const;
  bool HoldsHeader(Number offset) const;
  Address AddressOf(Number offset) const;
  void DescribeRecords(BucketReport& bucket) const;
  void DescribeMap(Map& map) const;
  void DescribeFreeList(BucketReport& bucket) const;

  template <class Visitor>
  void ForEach(Visitor visit) const;

  const Library& library;
  const Structures& structures;
  const Structure& header;
  const std::optional<Structure> area;
  Number recsSize, recSize, freeHead, freeRecs, totalRecs;
};

} // namespace VOK::MemPool::Tools

#endif
