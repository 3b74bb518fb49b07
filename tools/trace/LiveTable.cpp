#include "trace/LiveTable.h"

namespace VOK::MemPool::Tools {

LiveRecord& LiveTable::FindOrAdd(std::uint64_t data) {
  std::size_t place = PlaceOf(data);
  if (places[place].line != 0) return places[place];
  if (2 * (size + 1) > places.size()) {
    Grow();
    place = PlaceOf(data);
  }
  ++size;
  places[place].data = data;
  return places[place];
}

void LiveTable::Remove(LiveRecord& record) {
  auto gap = static_cast<std::size_t>(&record - places.data());
  const std::size_t last = places.size() - 1;
  for (std::size_t place = Next(gap); places[place].line != 0; place = Next(place)) {
    // It may move into the gap unless its home lies between the two.
    const std::size_t home = Home(places[place].data);
    if (((place - home) & last) < ((place - gap) & last)) continue;
    places[gap] = places[place];
    gap = place;
  }
  places[gap] = {};
  --size;
}

void LiveTable::Grow() {
  std::vector<LiveRecord> before(2 * places.size());
  before.swap(places);
  --shift;
  for (const LiveRecord& record : before)
    if (record.line != 0) places[PlaceOf(record.data)] = record;
}

} // namespace VOK::MemPool::Tools
