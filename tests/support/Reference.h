// The rules of a pool, step by step and without a pointer of the pool's own: lists are deques of
// addresses, and each block is an image of its bytes. From what the heap delivers in a call it
// predicts every address, byte, counter and line, and what a failing heap leaves.
#ifndef VOK_MEMPOOL_TESTS_REFERENCE_H
#define VOK_MEMPOOL_TESTS_REFERENCE_H

#include "support/ArenaHeap.h"
#include "support/Process.h"

#include <deque>
#include <stdexcept>

using Form = ArenaHeap::Form;

inline void Demand(bool condition, const char* what) {
  if (!condition) throw std::logic_error(what);
}

/// What a call did to the heap and to std::cout, for the reference to say the same step by step.
class Log : public Output {
public:
  explicit Log(ArenaHeap& heap_) : heap(heap_) {}

  /// The next event, which must be one of these kinds; '|' is the flush after `line`.
  const ArenaHeap::Event& Next(const std::string& kinds, const std::string& line = "") {
    Demand(at < heap.events.size() && kinds.find(heap.events[at].kind) != std::string::npos,
           "another use of heap or output");
    expected += line;
    return heap.events[at++];
  }
  void End() {
    Demand(at == heap.events.size() && heap.faults.empty(), "heap or output used more");
    Demand(Text() == std::exchange(expected, {}), "other lines");
    heap.events.clear();
    at = 0;
  }

private:
  int sync() override {
    const ArenaHeap::Use real(false);
    heap.events.push_back({'|', {}, 0, nullptr, {}});
    return 0;
  }

  ArenaHeap& heap;
  std::size_t at = 0;
  std::string expected;
};

class Reference {
public:
  struct Settings {
    std::uint32_t bucketSize, dataAlignment, maxRecSize, minRecSize;
    bool keepEmptyBuckets, on;

    /// What a pool makes of them.
    Settings Normalised() const {
      const std::uint32_t unit = std::max(dataAlignment % 65536, 1u);
      return {std::min(bucketSize, 65535u),
              unit,
              maxRecSize / unit * unit,
              std::max((minRecSize + unit - 1) / unit, 1u) * unit,
              keepEmptyBuckets,
              on};
    }
    bool IsPossible() const {
      const Settings s = Normalised();
      return s.maxRecSize + 4 <= s.bucketSize && s.minRecSize <= s.maxRecSize;
    }
    std::uint32_t NumGroups() const { return (maxRecSize - minRecSize) / dataAlignment + 1; }
    std::uint32_t Rounded(std::uint32_t size) const {
      return std::max((size + dataAlignment - 1) / dataAlignment, 1u) * dataAlignment;
    }
    /// The size class of a rounded size.
    std::uint32_t Index(std::uint32_t dataSize) const {
      return (std::max(dataSize + 4, minRecSize) - minRecSize) / dataAlignment;
    }
    /// The data bytes of its records: those of the largest size that it serves.
    std::uint32_t Capacity(std::uint32_t dataSize) const {
      const std::uint32_t next = dataSize + dataAlignment;
      return Index(next) == 0 && next + 4 <= maxRecSize ? Capacity(next) : dataSize;
    }
  };

  const Settings settings;
  std::map<std::uint8_t*, Bytes> blocks; ///< up to their last field or byte
  std::deque<std::uint8_t*> exts;

  Reference(Log& log_, const Settings& given, VOK::MemPool::Mgr* mgr_)
      : settings(given.Normalised()), log(log_), mgr(mgr_) {
    pool = AllocBlock(Form::Plain, 0);
    blocks[pool + sizeof(std::string)].resize(3 * P + 26);
    Trace("c:");
    try {
      table = AllocBlock(Form::Array, settings.NumGroups() * P, 0);
      node = AllocBlock(Form::Plain, 0);
    } catch (const std::bad_alloc&) {
      if (table != nullptr) End();
      FreeBlock(Form::Plain, pool);
      throw;
    }
  }
  void Destroy() {
    FreeBlock(Form::Plain, node);
    End();
    FreeBlock(Form::Plain, pool);
  }
  std::uint8_t* Alloc(std::uint32_t size) {
    const std::uint32_t dataSize = settings.Rounded(size);
    std::uint8_t* const p = !settings.on                         ? AllocBlock(Form::Array, size)
                            : dataSize + 4 > settings.maxRecSize ? AllocExt(size)
                                                                 : AllocRec(dataSize);
    Trace("a:", ":" + Text(p) + ":" + std::to_string(size));
    return p;
  }
  bool Free(std::uint8_t* p) {
    if (p == nullptr) return false;
    Trace("f:", ":" + Text(p) + ":");
    if (!settings.on) return FreeBlock(Form::Array, p), true;
    if (RecordSize(p) > 0) return FreeRec(Around(p), p), true;
    if (ExtSize(p) == 0) return false;
    Scrub(p - extHeader, extHeader);
    std::erase(exts, p - extHeader);
    return true;
  }
  void Clear() {
    FreeExts();
    for (const auto& [index, group] : std::exchange(groups, {})) {
      for (std::uint8_t* bucket : group.all)
        Scrub(bucket, 5 * P + 4);
      FreeBlock(Form::Plain, group.at);
    }
    buckets.clear();
    Refresh();
  }
  bool Reset() {
    if (!settings.on) return false;
    FreeExts();
    for (auto& [index, group] : groups) {
      group.withFree = group.all;
      for (std::uint8_t* bucket : group.all)
        buckets[bucket].free = NewList(group);
    }
    return true;
  }
  std::size_t NumBuckets() const { return buckets.size(); }
  /// The bucket around an address, null if there is none.
  std::uint8_t* Around(std::uint8_t* p) const {
    const auto after = buckets.upper_bound(p);
    if (after == buckets.begin()) return nullptr;
    std::uint8_t* const at = std::prev(after)->first;
    return p < at + blocks.at(at).size() ? at : nullptr;
  }
  /// The data bytes of a used record, 0 for anything else.
  std::uint32_t RecordSize(std::uint8_t* p) const {
    std::uint8_t* const at = Around(p);
    if (at == nullptr) return 0;
    const auto& [group, free, next2] = buckets.at(at);
    const std::uint32_t offset = Number(p - 4 - at) - base;
    if (offset % group->recSize != 2 % group->recSize || std::ranges::count(free, offset) > 0)
      return 0;
    return group->recSize - 4;
  }
  /// The length of an ExtRec, 0 for anything else.
  std::uint32_t ExtSize(const std::uint8_t* p) const {
    const auto ext = std::ranges::find(exts, p - extHeader);
    return ext == exts.end() ? 0 : static_cast<std::uint32_t>(blocks.at(*ext).size() - extHeader);
  }
  bool IsFirstExt(const std::uint8_t* p) const { return At(exts, 0) == p - extHeader; }

  /// Brings all fields in the images up to date.
  void Refresh() {
    std::ranges::fill(blocks[table], std::uint8_t{0});
    for (const auto& [index, group] : groups) {
      Put(table, index * P, group.at);
      Put(group.at, 0, pool, At(group.all, 0), At(group.all, group.all.size() - 1),
          At(group.withFree, 0), Number(group.all.size()), Number(group.withFree.size()),
          Short(group.recSize - 4), Short(Total(group)));
      for (std::uint8_t* bucket : group.all)
        RefreshBucket(bucket);
    }
    for (std::size_t i = 0; i < exts.size(); ++i)
      Put(exts[i], 0, At(exts, i + 1), At(exts, i - 1));
    Put(pool + sizeof(std::string), 0, mgr, table, At(exts, 0), settings.NumGroups(),
        Number(exts.size()), settings.bucketSize, settings.dataAlignment, settings.maxRecSize,
        settings.minRecSize, settings.keepEmptyBuckets, settings.on);
  }

private:
  using List = std::deque<std::uint8_t*>;
  struct Group {
    std::uint8_t* at;
    std::uint32_t recSize;
    List all, withFree;
  };
  struct Bucket {
    Group* group;
    std::vector<std::uint32_t> free; // offsets, the last of which is served next
    std::uint8_t* next2;             // as it was when the bucket left the list
  };
  static constexpr std::size_t P = sizeof(void*);
  static constexpr std::size_t extHeader = 2 * P + 8;
  static constexpr std::uint32_t base = 5 * P + 6; // of a bucket's offsets

  std::uint8_t* AllocRec(std::uint32_t dataSize) {
    const std::uint32_t index = settings.Index(dataSize);
    if (!groups.contains(index)) {
      std::uint8_t* const at = AllocBlock(Form::Plain, 4 * P + 12);
      groups[index] = {at, settings.Capacity(dataSize) + 4, {}, {}};
    }
    Group& group = groups[index];
    if (group.withFree.empty()) {
      std::uint8_t* const at = AllocBlock(Form::Array, base + 2 + Total(group) * group.recSize);
      buckets[at] = {&group, NewList(group), nullptr};
      group.all.push_front(at);
      group.withFree.push_front(at);
    }
    std::uint8_t* const at = group.withFree.front();
    Bucket& bucket = buckets[at];
    std::uint8_t* const p = at + base + bucket.free.back() + 4;
    bucket.free.pop_back();
    if (bucket.free.empty()) {
      bucket.next2 = At(group.withFree, 1);
      group.withFree.pop_front();
    }
    return p;
  }
  void FreeRec(std::uint8_t* at, std::uint8_t* p) {
    Bucket& bucket = buckets[at];
    Group& group = *bucket.group;
    if (bucket.free.empty()) group.withFree.push_front(at);
    bucket.free.push_back(Number(p - 4 - at) - base);
    if (bucket.free.size() < Total(group) || settings.keepEmptyBuckets) return;
    RefreshBucket(at);
    std::erase(group.all, at);
    std::erase(group.withFree, at);
    buckets.erase(at);
    Scrub(at, 5 * P + 4);
  }
  std::uint8_t* AllocExt(std::uint32_t size) {
    std::uint8_t* const at = AllocBlock(Form::Array, extHeader + size);
    Put(at, 2 * P, size, Byte(0xAA), Byte(0xBB), Byte(2), Byte(0xCC));
    exts.push_front(at);
    return at + extHeader;
  }
  void End() {
    Trace("d:");
    Clear();
    FreeBlock(Form::Array, table);
  }
  std::uint32_t Total(const Group& of) const { return (settings.bucketSize - 2) / of.recSize; }

  // The free list of a new bucket.
  std::vector<std::uint32_t> NewList(const Group& group) const {
    std::vector<std::uint32_t> free;
    for (std::uint32_t k = Total(group); k > 0; --k)
      free.push_back(2 + (k - 1) * group.recSize);
    return free;
  }

  void RefreshBucket(std::uint8_t* at) {
    const auto& [group, free, next2] = buckets.at(at);
    const bool isFull = free.empty();
    const std::uint32_t end = 2 + Total(*group) * group->recSize;
    Put(at, 0, group->at, Beside(group->all, at, 1), Beside(group->all, at, -1),
        isFull ? next2 : Beside(group->withFree, at, 1),
        isFull ? nullptr : Beside(group->withFree, at, -1), Short(end), Short(group->recSize),
        Short(isFull ? 0 : free.back()), Short(free.size()));
    for (std::uint32_t own = 2; own < end; own += group->recSize)
      PutRec(at, own, own, 1);
    std::uint32_t next = 0;
    for (const std::uint32_t offset : free)
      PutRec(at, offset, std::exchange(next, offset), 0);
  }

  // A record's header has its low byte first on every machine.
  void PutRec(std::uint8_t* at, std::uint32_t own, std::uint32_t offset, int type) {
    Put(at, base + own, Byte(offset), Byte(offset >> 8), Byte(type));
  }

  static std::uint32_t Number(auto n) { return static_cast<std::uint32_t>(n); }
  static std::uint16_t Short(auto n) { return static_cast<std::uint16_t>(n); }
  static std::uint8_t Byte(auto n) { return static_cast<std::uint8_t>(n); }
  static std::uint8_t* At(const List& list, std::size_t i) {
    return i < list.size() ? list[i] : nullptr;
  }
  static std::uint8_t* Beside(const List& list, std::uint8_t* at, int step) {
    return At(list, std::size_t(std::ranges::find(list, at) - list.begin() + step));
  }
  // Writes the fields one after the other.
  void Put(std::uint8_t* block, std::size_t at, auto... fields) {
    ((std::memcpy(&blocks[block][at], &fields, sizeof fields), at += sizeof fields), ...);
  }

  std::uint8_t* AllocBlock(Form form, std::size_t size, std::uint8_t fill = ArenaHeap::delivered) {
    const ArenaHeap::Event& event = log.Next("+!");
    Demand(event.form == form && (event.size == size || form == Form::Plain), "another block");
    if (event.kind == '!') throw std::bad_alloc();
    auto* const at = static_cast<std::uint8_t*>(const_cast<void*>(event.block));
    blocks[at].assign(size, fill);
    return at;
  }
  void FreeBlock(Form form, std::uint8_t* at) {
    const ArenaHeap::Event& event = log.Next("-");
    Demand(event.form == form && event.block == at, "another block is freed");
    Demand(form == Form::Plain || event.bytes == blocks[at], "other bytes are freed");
    blocks.erase(at);
  }
  void FreeExts() {
    Refresh();
    for (std::uint8_t* ext : std::exchange(exts, {}))
      FreeBlock(Form::Array, ext);
  }
  // Frees a block whose header is zeroed.
  void Scrub(std::uint8_t* at, std::size_t header) {
    std::fill_n(blocks[at].begin(), header, std::uint8_t{0});
    FreeBlock(Form::Array, at);
  }
  void Trace(const std::string& letter, const std::string& operands = "") {
    if (VOK::MemPool::ZOR_VOK_MEMPOOL_TRACE())
      log.Next("|", "zvpt:" + letter + Text(pool) + operands + "\n");
  }
  static std::string Text(const void* p) {
    std::ostringstream os;
    os << std::hex << reinterpret_cast<std::uintptr_t>(p);
    return os.str();
  }

  Log& log;
  VOK::MemPool::Mgr* const mgr;
  std::uint8_t* pool = nullptr;
  std::uint8_t* table = nullptr;
  std::uint8_t* node = nullptr;
  std::map<std::uint32_t, Group> groups;
  std::map<std::uint8_t*, Bucket> buckets;
};

#endif
