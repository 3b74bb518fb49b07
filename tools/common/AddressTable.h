// Live blocks by address: a table with open addressing, since finding, adding and removing is
// nearly all the work of a long trace or recording. Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_COMMON_ADDRESSTABLE_H
#define VOK_MEMPOOL_TOOLS_COMMON_ADDRESSTABLE_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace VOK::MemPool::Tools {

/// Linear probing upward from the address's own place, around the end. At most half are in use.
/// `Entry` has the address as `data`, and says by `IsUsed` whether a place holds one.
template <class Entry>
class AddressTable {
public:
  std::size_t GetSize() const { return size; }
  const std::vector<Entry>& GetPlaces() const { return places; } ///< empty ones too

  /// The entry of that address, null if there is none. It stays until the next change.
  Entry* Find(std::uint64_t data) {
    Entry& place = places[PlaceOf(data)];
    return place.IsUsed() ? &place : nullptr;
  }

  /// The entry of that address or, if there is none, an empty one, which is to be used at once.
  Entry& FindOrAdd(std::uint64_t data) {
    std::size_t place = PlaceOf(data);
    if (places[place].IsUsed()) return places[place];
    if (2 * (size + 1) > places.size()) {
      Grow();
      place = PlaceOf(data);
    }
    ++size;
    places[place].data = data;
    return places[place];
  }

  /// Removes an entry and closes the gap in the probed places after it.
  void Remove(Entry& entry) {
    auto gap = static_cast<std::size_t>(&entry - places.data());
    const std::size_t last = places.size() - 1;
    for (std::size_t place = Next(gap); places[place].IsUsed(); place = Next(place)) {
      // It may move into the gap unless its home lies between the two.
      const std::size_t home = Home(places[place].data);
      if (((place - home) & last) < ((place - gap) & last)) continue;
      places[gap] = places[place];
      gap = place;
    }
    places[gap] = {};
    --size;
  }

  template <class Condition>
  void RemoveIf(Condition condition) {
    std::vector<Entry> before(places.size());
    before.swap(places);
    size = 0;
    for (const Entry& entry : before)
      if (entry.IsUsed() && !condition(entry)) FindOrAdd(entry.data) = entry;
  }

private:
  std::size_t Home(std::uint64_t data) const {
    return static_cast<std::size_t>(data * UINT64_C(0x9E3779B97F4A7C15) >> shift);
  }
  std::size_t Next(std::size_t place) const { return (place + 1) & (places.size() - 1); }

  std::size_t PlaceOf(std::uint64_t data) const {
    std::size_t place = Home(data);
    while (places[place].IsUsed() && places[place].data != data)
      place = Next(place);
    return place;
  }

  void Grow() {
    std::vector<Entry> before(2 * places.size());
    before.swap(places);
    --shift;
    for (const Entry& entry : before)
      if (entry.IsUsed()) places[PlaceOf(entry.data)] = entry;
  }

  std::vector<Entry> places = std::vector<Entry>(1024);
  unsigned shift = 64 - 10; ///< leaves the bits of a place
  std::size_t size = 0;
};

} // namespace VOK::MemPool::Tools

#endif
