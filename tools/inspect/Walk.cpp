#include "inspect/Walk.h"

#include "report/Form.h"

#include <algorithm>
#include <set>

namespace VOK::MemPool::Tools {

namespace {

/// The smallest record of the smallest alignment gives a table of this length.
constexpr Number maxGroups = 65536;

struct BucketCopy {
  Structure header;
  std::optional<Structure> area; ///< none if it can't be read
};

struct Group {
  Number index;
  Structure copy;
  std::vector<BucketCopy> buckets;
  std::vector<std::size_t> freeBuckets; ///< indices of those on the second list
};

Percent PercentUsed(Number used, Number total) {
  if (total == 0) return {};
  std::string text = fmt::format("{:.3f}", used * 100.0 / total);
  text.erase(text.size() - 4, 1);
  return {std::stoull(text)};
}

class Walk {
public:
  Walk(const Library& library_, const Structure& pool_)
      : library(library_), structures(library.layout.structures), visits(library_), pool(pool_) {}

  Pool Run(const std::string& name, bool detailed) {
    VisitGroups();
    VisitBuckets();
    VisitExtRecs();
    VisitAreas(); // last, since the length of one is the least certain
    Pool result;
    Report& report = result.report;
    report.name = name;
    DescribeHeader(report);
    DescribeHistogram(report);
    DescribeBuckets(report);
    DescribeFreeBuckets(report);
    DescribeExtRecs(report);
    if (detailed) DescribeEach(report);
    result.damages = visits.damages;
    return result;
  }

private:
  Number PoolNumber(std::uint32_t offset) const { return pool.Get<std::uint32_t>(offset); }

  Number HeaderNumber(const Structure& bucket, std::uint32_t offset) const {
    return bucket.Get<std::uint16_t>(offset);
  }

  void VisitGroups() {
    const Number numGroups = PoolNumber(structures.bucketMgr.numGroups);
    const std::uint32_t width = library.layout.pointerSize;
    if (numGroups > maxGroups) {
      visits.Damage("the pool says that it has {} size classes", numGroups);
      return;
    }
    const auto table =
        visits.Visit("the table of size classes", pool.GetPointer(structures.bucketMgr.groups),
                     numGroups * width);
    for (Number i = 0; table && i < numGroups; ++i) {
      const std::uint64_t address = table->GetPointer(i * width);
      if (address == 0) continue;
      const auto group =
          visits.Visit(fmt::format("size class {}", i), address, structures.group.size);
      if (!group) continue;
      if (group->GetPointer(structures.group.owner) != pool.address) {
        visits.Damage("size class {} at {:#x} is another pool's", i, address);
        continue;
      }
      groups.push_back({i, *group, {}, {}});
      groupAddresses.insert(address);
    }
  }

  void VisitBuckets() {
    for (Group& group : groups) {
      std::map<std::uint64_t, std::size_t> indices;
      for (std::uint64_t at = group.copy.GetPointer(structures.group.head1); at != 0;) {
        const auto bucket = visits.Visit("the bucket", at, structures.bucket.size);
        if (!bucket || !BelongsTo(group, *bucket)) break;
        indices.emplace(at, group.buckets.size());
        group.buckets.push_back({*bucket, {}});
        at = bucket->GetPointer(structures.bucket.next1);
      }
      for (std::uint64_t at = group.copy.GetPointer(structures.group.head2); at != 0;) {
        const auto found = indices.extract(at);
        if (found.empty()) {
          visits.Damage("the free bucket at {:#x} of size class {} is none of its buckets, or is "
                        "listed twice",
                        at, group.index);
          break;
        }
        group.freeBuckets.push_back(found.mapped());
        at = group.buckets[found.mapped()].header.GetPointer(structures.bucket.next2);
      }
    }
  }

  /// Whether the walk of a group's buckets goes on here. The parent alone can be damaged; that of
  /// another group shows that the link is.
  bool BelongsTo(const Group& group, const Structure& bucket) {
    const std::uint64_t parent = bucket.GetPointer(structures.bucket.parent);
    if (parent == group.copy.address) return true;
    const bool isForeign = groupAddresses.contains(parent);
    visits.Damage("the bucket at {:#x} in size class {} has the parent {:#x}", bucket.address,
                  group.index, parent);
    return !isForeign;
  }

  void VisitExtRecs() {
    for (std::uint64_t at = pool.GetPointer(structures.bucketMgr.extRecs); at != 0;) {
      const auto ext = visits.Visit("the ext record", at, structures.extRec.size);
      if (!ext) break;
      if (ext->Get<std::uint8_t>(structures.extRec.tag0) != 0xAA ||
          ext->Get<std::uint8_t>(structures.extRec.tag1) != 0xBB ||
          ext->Get<std::uint8_t>(structures.extRec.type) != 2 ||
          ext->Get<std::uint8_t>(structures.extRec.tag3) != 0xCC)
        visits.Damage("the ext record at {:#x} has a damaged tag", at);
      extRecs.push_back(*ext);
      at = ext->GetPointer(structures.extRec.next);
    }
  }

  /// The records of each bucket, together with the field that their offsets count from.
  void VisitAreas() {
    for (Group& group : groups)
      for (BucketCopy& bucket : group.buckets) {
        const std::uint64_t begin = bucket.header.address + structures.bucket.freeRecs;
        const Number recsSize = HeaderNumber(bucket.header, structures.bucket.recsSize);
        const std::uint32_t inHeader = structures.bucket.size - structures.bucket.freeRecs;
        if (recsSize > inHeader &&
            !visits.Visit("the record area", begin + inHeader, recsSize - inHeader))
          continue;
        bucket.area = library.Fetch(begin, recsSize);
      }
  }

  void DescribeHeader(Report& report) {
    report.version = library.layout.version;
    report.addr = {pool.address};
    report.sizeofPool = structures.bucketMgr.size;
    report.bucketSize = PoolNumber(structures.bucketMgr.bucketSize);
    report.numGroups = PoolNumber(structures.bucketMgr.numGroups);
    report.numExtRecs = report.extRecs.count = PoolNumber(structures.bucketMgr.numExtRecs);
    report.enabled = pool.Get<std::uint8_t>(structures.bucketMgr.enabled);
    report.maxExtSize = structures.limits.maxRequest;
    report.minBucketSize = structures.limits.minBucketSize;
    report.maxBucketSize = structures.limits.maxBucketSize;
    report.minRecSize = PoolNumber(structures.bucketMgr.minRecSize);
    report.maxRecSize = PoolNumber(structures.bucketMgr.maxRecSize);
    report.dataAlignment = PoolNumber(structures.bucketMgr.dataAlignment);
    report.sizeofBucket = structures.bucket.size;
    report.sizeofHeader = report.sizeofFree = report.sizeofUsed = structures.rec.size;
    for (const Group& group : groups) {
      report.numBuckets += group.copy.Get<std::uint32_t>(structures.group.numBuckets);
      report.freeBucks += group.copy.Get<std::uint32_t>(structures.group.numFreeBuckets);
      report.freeBucksM = group.copy.Get<std::uint16_t>(structures.group.dataSize);
    }
    report.buckets.count = report.numBuckets;
    report.freeBuckets.count = report.freeBucks;
    report.freeBucketsM = report.freeBucksM;
  }

  void DescribeBuckets(Report& report) const {
    Number id = 0;
    for (const Group& group : groups)
      for (const auto& [header, area] : group.buckets) {
        const Number recSize = HeaderNumber(header, structures.bucket.recSize);
        const Number recsSize = HeaderNumber(header, structures.bucket.recsSize);
        const Number total = recSize == 0 || recsSize < 2 ? 0 : (recsSize - 2) / recSize;
        const Number free = HeaderNumber(header, structures.bucket.freeRecs);
        const Number used = total - free;
        report.usedRecs += used;
        report.freeRecs += free;
        report.empty += free == total ? 1 : 0;
        report.full += free == 0 ? 1 : 0;
        report.buckets.rows.push_back({++id,
                                       group.index,
                                       used,
                                       free,
                                       total,
                                       PercentUsed(used, total),
                                       recSize,
                                       {header.address}});
      }
  }

  void DescribeHistogram(Report& report) const {
    std::map<Number, Number> sizes;
    for (const Group& group : groups)
      for (const auto& [header, area] : group.buckets) {
        const Number used = Records(library, header, area).CountUsed();
        if (used > 0)
          sizes[HeaderNumber(header, structures.bucket.recSize) - structures.rec.size] += used;
      }
    for (const Structure& ext : extRecs)
      ++sizes[ext.Get<std::uint32_t>(structures.extRec.length)];
    Number peak = 0;
    for (const auto& [size, frequency] : sizes)
      peak = std::max(peak, frequency);
    const Number scale = std::max<Number>(peak / (maxStars / 2), 1);
    report.histogram.count = static_cast<Number>(sizes.size());
    Number id = 0;
    for (const auto& [size, frequency] : sizes)
      report.histogram.rows.push_back({++id, size, frequency, {frequency / scale + 1}});
  }

  void DescribeFreeBuckets(Report& report) const {
    Number id = 0;
    for (const Group& group : groups) {
      if (group.freeBuckets.empty()) continue;
      ++id;
      Number off = 0;
      for (const std::size_t i : group.freeBuckets) {
        const Structure& header = group.buckets[i].header;
        report.freeBuckets.rows.push_back(
            {off == 0,
             id,
             group.index,
             HeaderNumber(header, structures.bucket.recSize) - structures.rec.size,
             static_cast<Number>(group.freeBuckets.size()),
             off,
             {header.address}});
        ++off;
      }
    }
  }

  void DescribeExtRecs(Report& report) const {
    Number id = 0;
    for (const Structure& ext : extRecs)
      report.extRecs.rows.push_back({++id,
                                     ext.Get<std::uint32_t>(structures.extRec.length),
                                     {library.Sum(ext.address, structures.extRec.size)},
                                     {ext.address},
                                     {ext.GetPointer(structures.extRec.next)},
                                     {ext.GetPointer(structures.extRec.prev)}});
  }

  void DescribeEach(Report& report) const {
    Number number = 0;
    for (const Group& group : groups)
      for (const auto& [header, area] : group.buckets) {
        report.bucketReports.emplace_back().number = ++number;
        Records(library, header, area).Describe(report.bucketReports.back());
      }
  }

  const Library& library;
  const Structures& structures;
  Visits visits;
  const Structure& pool;
  std::vector<Group> groups;
  std::set<std::uint64_t> groupAddresses;
  std::vector<Structure> extRecs;
};

} // namespace

std::optional<Structure> Visits::Visit(std::string_view what, std::uint64_t address,
                                       std::uint32_t size) {
  const std::uint64_t end = address + size;
  const auto after = visited.upper_bound(address);
  if ((after != visited.end() && after->first < end) ||
      (after != visited.begin() && std::prev(after)->second > address)) {
    Damage("{} at {:#x} overlaps what another link leads to", what, address);
    return std::nullopt;
  }
  std::optional<Structure> copy = library.Fetch(address, size);
  if (copy)
    visited.emplace(address, end);
  else
    Damage("{} at {:#x} can't be read", what, address);
  return copy;
}

Pool WalkPool(const Library& library, std::uint64_t pool, const std::string& name, bool detailed) {
  const Structures& structures = library.layout.structures;
  const std::optional<Structure> copy = library.Fetch(pool, structures.bucketMgr.size);
  if (copy) return Walk(library, *copy).Run(name, detailed);
  Pool unreadable;
  unreadable.report.name = name;
  unreadable.damages.push_back(fmt::format("the pool at {:#x} can't be read", pool));
  return unreadable;
}

} // namespace VOK::MemPool::Tools
