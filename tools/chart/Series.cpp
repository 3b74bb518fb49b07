#include "chart/Series.h"

#include "report/Summary.h"

#include <map>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

/// The series of a key, which is new in `series` if it isn't in `places`.
template <class Key>
PoolSeries& SeriesOfKey(Series& series, std::map<Key, std::size_t>& places, const Key& key,
                        const std::string& name) {
  const auto [at, isNew] = places.try_emplace(key, series.pools.size());
  if (isNew) series.pools.push_back({name, {}});
  return series.pools[at->second];
}

} // namespace

Series SeriesOf(const std::vector<Report>& reports) {
  Series series;
  std::map<std::string, std::size_t> places;
  for (const Report& report : reports) {
    PoolSeries& pool = SeriesOfKey(series, places, report.name, report.name);
    const bool isRepeated =
        !pool.points.empty() && pool.points.back().place + 1 == series.lines.size();
    if (series.lines.empty() || isRepeated) series.lines.push_back(report.line);
    const Bytes bytes = BytesOf(report);
    pool.points.push_back({series.lines.size() - 1, bytes.held, bytes.payload});
  }
  return series;
}

Series SeriesOf(const std::vector<History::Snapshot>& snapshots, const PoolNames& names) {
  Series series;
  std::map<PoolId, std::size_t> places;
  for (const History::Snapshot& snapshot : snapshots) {
    if (snapshot.pools.empty() && series.lines.empty()) continue;
    series.lines.push_back(snapshot.line);
    for (const History::PoolBytes& one : snapshot.pools)
      SeriesOfKey(series, places, one.pool, NameOf(names, one.pool))
          .points.push_back({series.lines.size() - 1, std::nullopt, one.bytes});
  }
  return series;
}

} // namespace VOK::MemPool::Tools
