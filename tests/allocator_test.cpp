// The adaptors: alignment under all settings, the bytes that it costs, real containers, objects
// behind unique pointers and behind their own operator new, and nothing left in a pool.
#include "children/parts_module.h"

#include <MemPoolAllocator>

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <deque>
#include <iostream>
#include <list>
#include <map>
#include <memory_resource>
#include <set>
#include <sstream>
#include <stdexcept>
#include <string>
#include <unordered_map>
#include <vector>

namespace {

using namespace VOK::MemPool;

constexpr bool isWide = sizeof(void*) == 8;
constexpr bool isEmulated = VOK_MEMPOOL_EMULATED;

struct Settings {
  unsigned alignment, bucket, min, max;
  bool on;
};

constexpr Settings defaults{4, 4010, 8, 1000, true};
constexpr Settings settings[] = {
    defaults,
    {1, 4010, 8, 1000, true},
    {1, 4011, 5, 4006, true},
    {2, 4010, 8, 1000, true},
    {6, 4010, 8, 1000, true},
    {8, 4010, 8, 1000, true},
    {12, 4010, 8, 1000, true},
    {16, 4010, 8, 1000, true},
    {4, 1037, 100, 500, true},
    {4, 65535, 8, 32767, true},
    {64, 4010, 64, 64, true}, // no request fits
    {4, 4010, 8, 1000, false},
    {1, 4010, 8, 1000, false},
};

std::ostream& operator<<(std::ostream& os, const Settings& s) {
  return os << "alignment " << s.alignment << ", bucket " << s.bucket << ", records " << s.min
            << " to " << s.max << (s.on ? ", on" : ", off");
}

void Set(const Settings& s) {
  ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(s.alignment);
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(s.bucket);
  ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(s.min);
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(s.max);
  ZOR_VOK_MEMPOOL_ON(s.on);
}

/// What the report counts as in use, large blocks included. A pool with pooling off counts nothing;
/// there the leak check of the address sanitizer does.
unsigned long InUse(const Mgr& mgr) {
  std::ostringstream text;
  std::streambuf* const buffer = std::cout.rdbuf(text.rdbuf());
  mgr.Dbg();
  std::cout.rdbuf(buffer);
  const auto count = [report = text.str()](const char* label) {
    return std::stoul(report.substr(report.find(label) + std::strlen(label)));
  };
  return count("Used Recs   :") + count("Ext Recs    :");
}

const char* AutomaticName(const Settings& s) {
  Set(s);
  return nullptr;
}

/// A pool under given settings that must be empty in the end.
class Pool : public Mgr {
public:
  explicit Pool(const Settings& s) : Mgr(AutomaticName(s)) { Set(defaults); }
  ~Pool() { EXPECT_EQ(InUse(*this), 0U); }
};

bool IsAligned(const volatile void* p, std::size_t alignment) {
  return reinterpret_cast<std::uintptr_t>(p) % alignment == 0;
}

class Alignment : public testing::TestWithParam<Settings> {};
INSTANTIATE_TEST_SUITE_P(Settings, Alignment, testing::ValuesIn(settings));

// A few blocks live at a time, so that a request meets each residue of its size class.
TEST_P(Alignment, IsKeptForEverySize) {
  struct Block {
    unsigned char* p;
    std::size_t size, alignment;
    unsigned char pattern;
  };
  Pool pool(GetParam());
  Resource resource(pool);
  std::deque<Block> blocks;
  const auto release = [&](std::size_t left) {
    for (; blocks.size() > left; blocks.pop_front()) {
      const Block& b = blocks.front();
      const auto isIntact = [&b](unsigned char byte) { return byte == b.pattern; };
      ASSERT_TRUE(std::all_of(b.p, b.p + b.size, isIntact)) << b.size << ' ' << b.alignment;
      resource.deallocate(b.p, b.size, b.alignment);
    }
  };
  unsigned char pattern = 0;
  for (std::size_t alignment = 1; alignment <= 64; alignment *= 2)
    for (std::size_t size = 0; size <= 2000; size += isEmulated ? 7 : 1) {
      void* const p = resource.allocate(size, alignment);
      ASSERT_TRUE(IsAligned(p, alignment)) << size << ' ' << alignment;
      const bool isPlain = pool.IsEnabled() && pool.Contains(p);
      ASSERT_GE(isPlain ? pool.GetSize(p) : size, size);
      if (size > 0) std::memset(p, ++pattern, size);
      blocks.push_back({static_cast<unsigned char*>(p), size, alignment, pattern});
      release(size % 64 == 0 ? 3 : 17);
    }
  release(0);
}

// The bytes that a request takes from the pool under the default settings.
TEST(Alignment, CostsWhatIsDocumented) {
  constexpr struct {
    std::size_t size, alignment;
    unsigned wide, narrow;
  } cases[] = {
      {1, 1, 4, 4},          {24, 2, 24, 24},          {24, 4, 24, 24},
      {40, 8, 44, 48},       {48, 16, 60, 64},         {64, 32, 92, 96},
      {64, 64, 124, 128},    {44, 8, 52, 52},          {992, 8, 996, 1000},
      {1000, 8, 1008, 1008}, {2000, 16, 2016, 2016},   {997, 1, 997, 997},
      {2000, 4, 2000, 2000}, {4096, 4096, 8192, 8192}, {8, 1 << 24, (1 << 25), (1 << 25)},
  };
  Pool pool(defaults);
  Resource resource(pool);
  for (const auto& c : cases)
    for (int i = 0; i < 3; ++i) {
      void* const p = resource.allocate(c.size, c.alignment);
      void* const block = c.alignment > 4 ? Detail::Unmarked(p) : p;
      EXPECT_EQ(pool.GetSize(block), isWide ? c.wide : c.narrow) << c.size << ' ' << c.alignment;
      EXPECT_EQ(pool.Contains(p), c.alignment <= 4);
      resource.deallocate(p, c.size, c.alignment);
      resource.deallocate(pool.Alloc(5), 5, 1); // moves the next one on
    }
}

TEST(Allocator, HasTheTraitsOfAContainersOwnPool) {
  using Traits = std::allocator_traits<Allocator<int>>;
  static_assert(!std::is_default_constructible_v<Allocator<int>>);
  static_assert(std::is_convertible_v<Mgr&, Allocator<int>>);
  static_assert(sizeof(Allocator<int>) == sizeof(void*));
  static_assert(!Traits::is_always_equal::value);
  static_assert(!Traits::propagate_on_container_copy_assignment::value);
  static_assert(Traits::propagate_on_container_move_assignment::value);
  static_assert(Traits::propagate_on_container_swap::value);
  Pool a(defaults);
  Pool b(defaults);
  EXPECT_TRUE(Allocator<int>(a) == Allocator<char>(a));
  EXPECT_TRUE(Allocator<int>(a) != Allocator<int>(b));
  EXPECT_TRUE(Resource(a).is_equal(Resource(a)));
  EXPECT_FALSE(Resource(a).is_equal(Resource(b)));
  EXPECT_FALSE(Resource(a).is_equal(*std::pmr::new_delete_resource()));
}

struct alignas(32) Wide {
  char bytes[32];
};

TEST(Allocator, RefusesWhatWouldEndTheProcess) {
  constexpr std::size_t limit = 1073741823;
  constexpr std::size_t most = SIZE_MAX;
  for (const bool on : {true, false}) {
    Pool pool({4, 4010, 8, 1000, on});
    Resource resource(pool);
    constexpr std::size_t requests[][2] = {
        {limit + 1, 1}, {limit - 7, 32}, {most, 8}, {most - 7, 64}, {1, most / 2 + 1}};
    for (const auto& [size, alignment] : requests)
      EXPECT_THROW(static_cast<void>(resource.allocate(size, alignment)), std::bad_alloc);
    Allocator<Wide> wide(pool);
    EXPECT_THROW(wide.allocate(wide.max_size() + 1), std::bad_alloc);
    EXPECT_THROW(wide.allocate(most / sizeof(Wide) + 1), std::bad_array_new_length);
    EXPECT_THROW(MakeUnique<Wide[]>(pool, limit / sizeof(Wide)), std::bad_alloc);
    EXPECT_THROW(MakeUnique<Wide[]>(pool, most / sizeof(Wide) + 1), std::bad_array_new_length);
    using Pointer = std::unique_ptr<int>; // the count in front of them makes it too much
    EXPECT_THROW(MakeUnique<Pointer[]>(pool, most / sizeof(Pointer)), std::bad_array_new_length);
    EXPECT_THROW(MakeUnique<char[][3]>(pool, most / 3 + 1), std::bad_array_new_length);
    std::vector<int, Allocator<int>> vector(pool);
    EXPECT_EQ(vector.max_size(), (limit - 7) / sizeof(int));
    EXPECT_THROW(vector.reserve(vector.max_size() + 1), std::length_error);
  }
}

using Text = std::basic_string<char, std::char_traits<char>, Allocator<char>>;
template <class T>
using Vector = std::vector<T, Allocator<T>>;
template <class T>
using List = std::list<T, Allocator<T>>;

struct Hash {
  std::size_t operator()(const Text& text) const {
    return std::hash<std::string_view>()({text.data(), text.size()});
  }
};

TEST_P(Alignment, ServesContainers) {
  Pool a(GetParam());
  Pool b(GetParam());
  std::map<int, Text, std::less<>, Allocator<std::pair<const int, Text>>> map(a);
  std::unordered_map<Text, Vector<double>, Hash, std::equal_to<>,
                     Allocator<std::pair<const Text, Vector<double>>>>
      table(a);
  std::set<std::unique_ptr<int>, std::less<>, Allocator<std::unique_ptr<int>>> set(a);
  Vector<Wide> wides(a);
  for (int i = 0; i < 300; ++i) {
    const Text text(static_cast<std::size_t>(i % 90), 'x', a);
    map.emplace(i, text);
    table.try_emplace(Text(std::to_string(i).c_str(), a), static_cast<std::size_t>(i), 0.5, a);
    set.insert(std::make_unique<int>(i));
    wides.push_back({});
    ASSERT_TRUE(IsAligned(&map.find(i)->second, alignof(Text)));
    ASSERT_TRUE(IsAligned(&*set.begin(), alignof(std::unique_ptr<int>)));
    ASSERT_TRUE(IsAligned(&wides.back(), alignof(Wide)));
  }
  for (int i = 0; i < 300; i += 2)
    map.erase(i);
  EXPECT_EQ(map.size(), 150U);
  EXPECT_EQ(map.at(89), Text(89, 'x', a));
  EXPECT_EQ(table.at(Text("77", a)), Vector<double>(77, 0.5, a));
  set.extract(set.begin());
  EXPECT_EQ(set.size(), 299U);

  List<int> from({1, 2, 3}, a);
  List<int> to({4}, b);
  const int* const first = &from.front();
  swap(from, to);
  EXPECT_EQ(&to.front(), first);
  EXPECT_TRUE(to.get_allocator() == Allocator<int>(a));
  from = to; // keeps its pool
  EXPECT_EQ(from, List<int>({1, 2, 3}, b));
  EXPECT_TRUE(from.get_allocator() == Allocator<int>(b));
  from = std::move(to);
  EXPECT_EQ(&from.front(), first);
  EXPECT_TRUE(from.get_allocator() == Allocator<int>(a));
  const List<int> other(std::move(from), Allocator<int>(b)); // moves the elements
  EXPECT_EQ(other, List<int>({1, 2, 3}, a));
}

/// Tells of its making and its end, and throws where too many live.
struct Witness {
  static inline int living, limit;
  static inline std::string told;
  const char name;
  double number = 1;
  Witness() : name(static_cast<char>('a' + living)) {
    if (living == limit) throw std::runtime_error("one too many");
    ++living;
    told += {'+', name};
  }
  Witness(const Witness&) : Witness() {}
  ~Witness() {
    --living;
    told += {'-', name};
  }
};

TEST_P(Alignment, LosesNothingToAnException) {
  Pool pool(GetParam());
  for (Witness::limit = 0; Witness::limit < 6; ++Witness::limit) {
    EXPECT_THROW(Vector<Witness>(6, pool).resize(7), std::runtime_error);
    EXPECT_THROW(List<Witness>(7, Allocator<Witness>(pool)), std::runtime_error);
    EXPECT_THROW(MakeUnique<Witness[]>(pool, 7), std::runtime_error);
    EXPECT_EQ(Witness::living, 0);
  }
  Witness::limit = 0;
  EXPECT_THROW(MakeUnique<Witness>(pool), std::runtime_error);
}

TEST_P(Alignment, ServesNestedContainersOfAResource) {
  Pool pool(GetParam());
  Resource resource(pool);
  std::pmr::unsynchronized_pool_resource between(&resource);
  for (std::pmr::memory_resource* const r : {static_cast<std::pmr::memory_resource*>(&resource),
                                             static_cast<std::pmr::memory_resource*>(&between)}) {
    std::pmr::map<std::pmr::string, std::pmr::vector<std::pmr::string>> map(r);
    for (std::size_t i = 0; i < 200; ++i)
      map[std::to_string(i % 20).c_str()].emplace_back(i, 'x');
    EXPECT_EQ(map["19"].back(), std::string(199, 'x').c_str());
    EXPECT_EQ(map["19"].back().get_allocator().resource(), r);
  }
}

/// Counts those that live, and checks its place.
template <std::size_t N>
struct alignas(N) Part {
  static inline int living = 0;
  Part() {
    ++living;
    EXPECT_TRUE(IsAligned(this, N));
  }
  ~Part() { --living; }
  char bytes[N];
};

struct Base {
  virtual ~Base() = default;
  int base = 1;
};
struct Second {
  virtual ~Second() = default;
  int second = 2;
};
template <std::size_t N>
struct Both : Base, Second {
  explicit Both(int value_) : value(value_) {}
  const int value;
  Part<N> part;
};

template <std::size_t N>
void MakeAll(Mgr& pool) {
  {
    std::unique_ptr<Base, Deleter<Base>> base = MakeUnique<Both<N>>(pool, 3);
    std::unique_ptr<const Second, Deleter<const Second>> second = MakeUnique<Both<N>>(pool, 4);
    EXPECT_EQ(dynamic_cast<const Both<N>&>(*second).value, 4);
    base = MakeUnique<Both<N>>(pool, 5);
    EXPECT_EQ(dynamic_cast<const Both<N>&>(*base).value, 5);
    EXPECT_EQ(&base.get_deleter().Pool(), &pool);
    const auto part = MakeUnique<const Part<N>>(pool);
    std::unique_ptr<const Part<N>[], Deleter<const Part<N>[]>> parts =
        MakeUnique<Part<N>[]>(pool, 5);
    parts = MakeUnique<Part<N>[]>(pool, 99);
    const auto none = MakeUnique<Part<N>[]>(pool, 0);
    const auto grid = MakeUnique<const Part<N>[][2][3]>(pool, 5);
    EXPECT_EQ(Part<N>::living, 132);
    const auto numbers = MakeUnique<std::int16_t[][N]>(pool, N);
    EXPECT_EQ(numbers[N - 1][N - 1], 0);
    base.get_deleter()(nullptr);
  }
  EXPECT_EQ(Part<N>::living, 0);
}

/// Calls `use` for some alignments, each given as a constant.
template <std::size_t... alignments, class Use>
void ForEach(Use use) {
  (use(std::integral_constant<std::size_t, alignments>()), ...);
}

TEST_P(Alignment, ServesUniquePointers) {
  Pool pool(GetParam());
  ForEach<1, 2, 4, 8, 16, 32, 64>([&](auto alignment) { MakeAll<alignment()>(pool); });
}

TEST(Deleter, MakesAndDestroysArraysInTheStandardsOrder) {
  Pool pool(defaults);
  Witness::limit = 12;
  const auto toldOf = [](auto make) {
    Witness::told.clear();
    make();
    return Witness::told;
  };
  EXPECT_EQ(toldOf([&] { MakeUnique<Witness[]>(pool, 3); }), "+a+b+c-c-b-a");
  EXPECT_EQ(toldOf([&] { MakeUnique<Witness[][2][2]>(pool, 3); }),
            toldOf([] { std::make_unique<Witness[][2][2]>(3); }));
}

template <class From, class To>
constexpr bool isAsStandard =
    std::is_convertible_v<Deleter<From>, Deleter<To>> ==
    std::is_convertible_v<std::default_delete<From>, std::default_delete<To>>;

TEST(Deleter, ConvertsAsTheStandardOneDoes) {
  using D = Both<1>;
  static_assert(std::is_convertible_v<Deleter<D>, Deleter<const Second>>);
  static_assert(!std::is_convertible_v<Deleter<Base>, Deleter<D>>);
  static_assert(isAsStandard<D, Base> && isAsStandard<const D, D> && isAsStandard<D, D[]>);
  static_assert(isAsStandard<D[], const D[]> && isAsStandard<D[], Base[]>);
  static_assert(isAsStandard<D[][2], const D[][2]> && isAsStandard<D[][2], D[][3]>);
  static_assert(isAsStandard<D[][2], D[]> && isAsStandard<D[], D>);
  static_assert(!std::is_invocable_v<Deleter<Base[]>, D*>);
  static_assert(sizeof(std::unique_ptr<D, Deleter<D>>) == 2 * sizeof(void*));
}

struct OnParts {
  static constexpr const char* name = "parts";
};
struct OffParts {
  static constexpr const char* name = "heap parts";
};

template <std::size_t N, class Tag>
struct Bolt : Pooled<Bolt<N, Tag>, Tag> {
  explicit Bolt(bool isBroken = false) {
    if (isBroken) throw std::runtime_error("broken");
  }
  virtual ~Bolt() = default;
  Part<N> part;
};
template <std::size_t N, class Tag>
struct Screw final : Bolt<1, Tag> {
  Part<N> more;
};
template <std::size_t N, class Tag>
struct Nut final : Pooled<Nut<N, Tag>, Tag> {
  Part<N> part;
};

template <std::size_t N, class Tag>
void UseAll() {
  using B = Bolt<N, Tag>;
  using Line = Nut<N, Tag>;
  const std::align_val_t alignment{N};
  for (int i = 0; i < 2; ++i) { // the second time round the residues differ
    void* const kept = B::operator new(5);
    delete new B;
    delete static_cast<Bolt<1, Tag>*>(new Screw<N, Tag>);
    delete[] new B[3];
    delete new (std::nothrow) B;
    delete[] new (std::nothrow) Line[3];
    delete new Line;
    EXPECT_THROW(new B(true), std::runtime_error);
    EXPECT_THROW(new (std::nothrow) B(true), std::runtime_error);
    EXPECT_EQ((Part<N>::living), 0);

    void* p = Line::operator new(sizeof(Line));
    Line* const line = new (p) Line;
    line->~Line();
    Line::operator delete(p, sizeof(Line));
    p = B::operator new[](0);
    B::operator delete[](p, std::size_t{0});
    p = B::operator new(24, alignment);
    EXPECT_TRUE(IsAligned(p, N));
    B::operator delete(p, 24, alignment);
    p = B::operator new[](24, alignment, std::nothrow);
    EXPECT_TRUE(IsAligned(p, N));
    B::operator delete[](p, 24, alignment);
    EXPECT_EQ(B::operator new(2000000000, std::nothrow), nullptr);
    B::operator delete(nullptr);
    B::operator delete(kept);
  }
}

TEST(Pooled, TakesEveryFormFromOneStandingPool) {
  Set({4, 4010, 8, 1000, false});
  ForEach<1, 4, 8, 16, 64>([](auto alignment) { UseAll<alignment(), OffParts>(); });
  Set(defaults);
  EXPECT_EQ(GetMgr("parts"), nullptr);
  ForEach<1, 4, 8, 16, 64>([](auto alignment) { UseAll<alignment(), OnParts>(); });
  Mgr* const pool = GetMgr("parts");
  ASSERT_NE(pool, nullptr);
  EXPECT_TRUE(pool->IsEnabled());
  EXPECT_FALSE(GetMgr("heap parts")->IsEnabled());
  EXPECT_EQ((&Bolt<8, OnParts>::Pool()), pool);
  {
    const std::unique_ptr<Nut<8, OnParts>> nut(new Nut<8, OnParts>);
    EXPECT_EQ(InUse(*pool), 1U);
  }
  EXPECT_EQ(InUse(*pool), 0U);
}

TEST(Pooled, MeetsInOnePoolFromTwoModules) {
  Set(defaults);
  EXPECT_NE(partsModule.pool, &Rivet::Pool) << "each module has its own";
  const std::unique_ptr<Rivet> made(partsModule.make());
  EXPECT_STREQ(Rivet::Pool().GetName(), "rivets");
  EXPECT_EQ(&partsModule.pool(), &Rivet::Pool());
  partsModule.destroy(new Rivet);
  EXPECT_EQ(InUse(Rivet::Pool()), 1U);
}

} // namespace
