// The live records of a trace by address: a table with open addressing, since finding, adding and
// removing is nearly all the work of a long trace.
// Test: tests/tools/tools_test.py.
#ifndef VOK_MEMPOOL_TOOLS_TRACE_LIVETABLE_H
#define VOK_MEMPOOL_TOOLS_TRACE_LIVETABLE_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace VOK::MemPool::Tools {

struct LiveRecord {
  std::uint64_t data = 0;  ///< what the caller holds
  std::uint64_t line = 0;  ///< of its request; 0 in an empty place of the table
  std::uint64_t event = 0; ///< its number among the trace lines
  std::uint32_t size = 0;  ///< as asked for
  std::uint32_t pool = 0;  ///< the key of its pool
};

/// Linear probing upward from the address's own place, around the end. At most half are in use.
class LiveTable {
public:
  std::size_t GetSize() const { return size; }
  const std::vector<LiveRecord>& GetPlaces() const { return places; } ///< empty ones too

  /// The record of that address, null if there is none. It stays until the next change.
  LiveRecord* Find(std::uint64_t data) {
    LiveRecord& place = places[PlaceOf(data)];
    return place.line == 0 ? nullptr : &place;
  }

  /// The record of that address or, if there is none, an empty one, which is to get a line at once.
  LiveRecord& FindOrAdd(std::uint64_t data);

  /// Removes a record and closes the gap in the probed places after it.
  void Remove(LiveRecord& record);

  template <class Condition>
  void RemoveIf(Condition condition) {
    std::vector<LiveRecord> before(places.size());
    before.swap(places);
    size = 0;
    for (const LiveRecord& record : before)
      if (record.line != 0 && !condition(record)) FindOrAdd(record.data) = record;
  }

private:
  std::size_t Home(std::uint64_t data) const {
    return static_cast<std::size_t>(data * UINT64_C(0x9E3779B97F4A7C15) >> shift);
  }
  std::size_t Next(std::size_t place) const { return (place + 1) & (places.size() - 1); }

  std::size_t PlaceOf(std::uint64_t data) const {
    std::size_t place = Home(data);
    while (places[place].line != 0 && places[place].data != data)
      place = Next(place);
    return place;
  }

  void Grow();

  std::vector<LiveRecord> places = std::vector<LiveRecord>(1024);
  unsigned shift = 64 - 10; ///< leaves the bits of a place
  std::size_t size = 0;
};

} // namespace VOK::MemPool::Tools

#endif
