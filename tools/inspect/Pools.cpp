#include "inspect/Pools.h"

#include "inspect/Walk.h"
#include "report/Form.h"
#include "report/Formats.h"

#include <algorithm>
#include <chrono>
#include <iterator>
#include <map>
#include <thread>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

/// The names of pools, each with the pool that its handle holds.
struct Registry {
  std::vector<PoolPlace> entries;
  std::vector<std::string> damages;
  bool operator==(const Registry&) const = default;
};

/// The text up to a zero byte; nothing if there is none within the bound.
std::optional<std::string> ReadText(const Memory& memory, std::uint64_t address) {
  constexpr std::size_t piece = 64;
  constexpr std::size_t maxLength = 1 << 16;
  std::string text;
  // Pieces end where pages may.
  for (std::size_t size = piece - address % piece; text.size() < maxLength; size = piece) {
    const std::size_t before = text.size();
    text.resize(before + size);
    if (!memory.read(address + before, text.data() + before, size)) return std::nullopt;
    if (const std::size_t end = text.find('\0', before); end != std::string_view::npos) {
      text.resize(end);
      return text;
    }
  }
  return std::nullopt;
}

class RegistryWalk {
public:
  explicit RegistryWalk(const Library& library_) : library(library_), visits(library_) {}

  Registry Run() {
    const std::optional<Structure> first =
        library.Fetch(library.layout.first, library.layout.pointerSize);
    if (!first) throw Failure("the registry of its pools can't be read");
    const auto& fields = library.layout.structures.entry;
    for (std::uint64_t at = first->GetPointer(0); at != 0;) {
      const auto entry = visits.Visit("the registry's entry", at, fields.size);
      if (!entry) break;
      entries.push_back({NameOf(*entry), entry->GetPointer(fields.pool)});
      at = entry->GetPointer(fields.next);
    }
    Registry registry{entries, visits.damages};
    for (PoolPlace& entry : registry.entries)
      Follow(entry);
    return registry;
  }

private:
  std::string NameOf(const Structure& entry) {
    const std::uint64_t address = entry.GetPointer(library.layout.structures.entry.name);
    return ReadText(library.memory, address)
        .value_or(fmt::format("(unknown, {:#x})", entry.address));
  }

  /// A handle reports the pool that it holds, which an assignment may have changed.
  void Follow(PoolPlace& entry) const {
    const Structures& structures = library.layout.structures;
    const auto pool = library.Fetch(entry.pool, structures.bucketMgr.size);
    if (!pool) return;
    const auto mgr = library.Fetch(pool->GetPointer(structures.bucketMgr.mgr), structures.mgr.size);
    if (!mgr) return;
    const std::uint64_t held = mgr->GetPointer(structures.mgr.bucketMgr);
    if (held == entry.pool) return;
    const auto found = std::ranges::find(entries, held, &PoolPlace::pool);
    if (found != entries.end()) entry = *found;
  }

  const Library& library;
  Visits visits;
  std::vector<PoolPlace> entries; ///< as the registry has them
};

bool IsSame(const Registry& a, const Registry& b) { return a == b; }
bool IsSame(const Pool& a, const Pool& b) {
  return a.damages == b.damages && WriteReport(a.report) == WriteReport(b.report);
}

/// Whether a thread has waited for a processor all the time since its time was `before`.
bool IsWaiting(const Memory& memory, const std::map<int, std::uint64_t>& before) {
  return std::ranges::any_of(memory.getRunnable(), [&](const auto& thread) {
    const auto found = before.find(thread.first);
    return found != before.end() && found->second == thread.second;
  });
}

/// What two passes agree on, or the last of four with false. A damage can be the state within an
/// operation: so four passes over some time have to agree on one, and a thread that gets no
/// processor meanwhile may be in the midst of one.
template <class Read>
auto ReadAgreed(const Memory& memory, Read read) {
  constexpr int most = 3;
  int numSame = 0;
  const auto before = memory.getRunnable();
  auto result = read();
  for (int i = 0; i < most; ++i) {
    if (!result.damages.empty()) std::this_thread::sleep_for(std::chrono::milliseconds(100));
    auto again = read();
    numSame = IsSame(result, again) ? numSame + 1 : 0;
    result = std::move(again);
    if (numSame > 0 && result.damages.empty()) return std::pair(result, true);
  }
  return std::pair(result, numSame == most && !IsWaiting(memory, before));
}

class LibraryWalk {
public:
  LibraryWalk(const Library& library_, bool detailed_)
      : library(library_), detailed(detailed_), isChanging(library.memory.isChanging) {}

  void Run(Pools& pools) const {
    const auto [registry, isAgreed] = ReadRegistry();
    if (isAgreed) std::ranges::copy(registry.damages, std::back_inserter(pools.damages));
    for (const PoolPlace& entry : registry.entries) {
      Pool pool = ReadPool(entry);
      if (pool.damages.empty() || !isChanging || IsThere(entry))
        pools.all.push_back(std::move(pool));
    }
  }

private:
  std::pair<Registry, bool> ReadRegistry() const {
    const auto read = [&] { return RegistryWalk(library).Run(); };
    return isChanging ? ReadAgreed(library.memory, read) : std::pair(read(), true);
  }

  Pool ReadPool(const PoolPlace& entry) const {
    const auto read = [&] { return WalkPool(library, entry.pool, entry.name, detailed); };
    if (!isChanging) return read();
    auto [pool, isAgreed] = ReadAgreed(library.memory, read);
    pool.isMoving = !isAgreed;
    return pool;
  }

  /// The process may have destroyed a pool meanwhile.
  bool IsThere(const PoolPlace& entry) const {
    return std::ranges::count(ReadRegistry().first.entries, entry) > 0;
  }

  const Library& library;
  const bool detailed, isChanging;
};

} // namespace

std::vector<PoolPlace> ListPools(const Library& library) {
  return RegistryWalk(library).Run().entries;
}

Pools ReadPools(const Memory& memory, bool detailed) {
  const std::vector<Library> libraries = FindLibraries(memory);
  if (libraries.empty()) throw Failure("it has no libVokMemPool 1.1 or later");
  Pools pools;
  for (const Library& library : libraries)
    LibraryWalk(library, detailed).Run(pools);
  std::size_t line = 1;
  for (Pool& pool : pools.all) {
    pool.report.line = line;
    line = NumberLines(pool.report);
  }
  return pools;
}

} // namespace VOK::MemPool::Tools
