// What a program asks of its heap: by size, by lifetime, by call site, and over time.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_STATISTICS_H
#define VOK_MEMPOOL_TOOLS_ADVISE_STATISTICS_H

#include "advise/Symbols.h"
#include "common/AddressTable.h"
#include "record/Reader.h"

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

namespace VOK::MemPool::Tools {

/// Counts by the logarithm: the first is of 0, then 1, 2 to 3, 4 to 7, ...
using LogCounts = std::array<std::uint64_t, 65>;

/// The requests of one place of the program: the innermost function that doesn't belong to the
/// allocator or to the C++ runtime, at its line.
struct Site {
  Location where;
  std::vector<std::string> through; ///< the functions of the runtime from malloc outward
  std::uint64_t requests = 0, frees = 0, reallocs = 0, bytes = 0;
  std::uint64_t aligned = 0;        ///< requests of an alignment above 16
  std::uint64_t freedElsewhere = 0; ///< by another thread than the one that allocated
  std::uint64_t freedTogether = 0;  ///< in rows of releases that left none of the site's blocks
  std::uint64_t live = 0, liveBytes = 0, peakBytes = 0;
  std::uint64_t bytesAtPeak = 0; ///< of the program's peak
  std::uint64_t maxSize = 0;
  std::map<std::uint64_t, std::uint64_t> sizes; ///< requests by size, of the first sizes
  std::uint64_t otherSizes = 0;                 ///< requests of further sizes
  LogCounts lifetimes{};                        ///< in requests of the program
  std::uint64_t run = 0;                        ///< releases since the site's last request
};

/// Live bytes of each site at one moment.
struct Sample {
  std::uint64_t event = 0, time = 0;
  std::vector<std::uint64_t> liveBytes; ///< by site; sites that came later are missing
};

class Statistics {
public:
  explicit Statistics(Recording& recording);

  /// Reads the recording to its end.
  void Read();

  /// The site of a stack that was read.
  std::uint32_t GetSite(std::uint32_t stack) const { return siteOfStack[stack]; }

  /// Releases by lifetime.
  LogCounts GetLifetimes() const;

  /// What called a site, with the requests that came that way, the most first.
  std::vector<std::pair<std::string, std::uint64_t>> GetCallers(std::uint32_t site) const;

  std::vector<Site> sites;
  std::vector<Sample> samples;
  std::uint64_t requests = 0, frees = 0, reallocs = 0, unknownFrees = 0, bytes = 0;
  std::uint64_t live = 0, liveBytes = 0, peakBytes = 0, peakEvent = 0;
  std::uint32_t threads = 0;
  std::uint64_t time = 0;
  LogCounts sizes{};                    ///< requests
  std::array<LogCounts, 65> released{}; ///< blocks by size and by lifetime

private:
  struct LiveBlock {
    std::uint64_t data = 0; ///< its number
    std::uint64_t size = 0, request = 0;
    std::uint32_t site = 0;
    std::uint16_t thread = 0;
    bool IsUsed() const { return data != 0; }
  };

  void Take(const RecordedEvent& event);
  void Add(const RecordedEvent& event);
  void Remove(std::uint64_t number, std::uint32_t thread);
  std::uint32_t SiteOf(std::uint32_t stack);
  void KeepPeak();
  void AddSample();
  void ThinSamples();

  Recording& recording;
  Symbols symbols;
  std::vector<std::uint32_t> siteOfStack;
  std::unordered_map<std::string, std::uint32_t> siteByText;
  std::unordered_map<std::uint32_t, std::string> callersOfStack;
  std::unordered_map<std::uint32_t, std::uint64_t> requestsOfStack;
  AddressTable<LiveBlock> blocks;
  bool isPeakKept = true;
  std::uint64_t interval = 1; ///< events from sample to sample
};

/// The position of a number in LogCounts.
unsigned LogOf(std::uint64_t number);

} // namespace VOK::MemPool::Tools

#endif
