// The adaptors: alignment under all settings, the bytes that it costs, every way in which one makes
// and destroys objects, requests that are too large, and nothing left in a pool.
#include "support/Process.h"

#include <MemPoolAllocator>

#include <gmock/gmock.h>

#include <list>
#include <memory_resource>
#include <stdexcept>

namespace {

using namespace VOK::MemPool;

/// Expects that the report counts nothing as in use, large blocks included. Of a pool with pooling
/// off it never does; there the leak check of the address sanitizer finds what is left.
void ExpectEmpty(const Mgr& pool) {
  Output output;
  pool.Dbg();
  EXPECT_THAT(output.Text(),
              testing::HasSubstr("Used Recs   :        0\n   Ext Recs    :        0\n"));
}

/// Each pool must be empty in the end.
void ForEachSetting(const std::function<void(Mgr&)>& use) {
  const KeepSettings settings{};
  for (const std::string alignment : {"1", "2", "4", "6", "8", "12", "16"})
    for (const char* const more : {" on=0", " on=1 max=64", " max=1000", " max=4006"}) {
      Set("align=" + alignment + more);
      Mgr pool;
      use(pool);
      ExpectEmpty(pool);
    }
}

TEST(Resource, AlignsEverySize) {
  ForEachSetting([](Mgr& pool) {
    Resource resource(pool);
    for (std::size_t alignment = 1; alignment <= 64; alignment *= 2) {
      std::map<std::size_t, char*> blocks; // by their size
      for (std::size_t size = 0; size < 2000; size += VOK_MEMPOOL_EMULATED ? 7 : 1) {
        auto* const p = static_cast<char*>(resource.allocate(size, alignment));
        ASSERT_EQ(reinterpret_cast<std::uintptr_t>(p) % alignment, 0U) << size << ' ' << alignment;
        blocks[size] = std::fill_n(p, size, static_cast<char>(size)) - size;
      }
      for (const auto& [size, p] : blocks) {
        ASSERT_EQ(std::count(p, p + size, static_cast<char>(size)), size) << alignment;
        resource.deallocate(p, size, alignment);
      }
    }
  });
}

// The bytes that a request takes from the pool under the default settings, at 8-byte and at 4-byte
// pointers.
TEST(Resource, CostsWhatIsDocumented) {
  constexpr unsigned cases[][4] = {
      {1, 1, 4, 4},          {24, 2, 24, 24},          {24, 4, 24, 24},        {40, 8, 44, 48},
      {48, 16, 60, 64},      {64, 32, 92, 96},         {64, 64, 124, 128},     {44, 8, 52, 52},
      {992, 8, 996, 1000},   {1000, 8, 1008, 1008},    {2000, 16, 2016, 2016}, {997, 1, 997, 997},
      {2000, 4, 2000, 2000}, {4096, 4096, 8192, 8192},
  };
  const KeepSettings settings{};
  Set("on=1");
  Mgr pool;
  Resource resource(pool);
  const auto expect = [&](unsigned size, unsigned alignment, unsigned taken) {
    void* const p = resource.allocate(size, alignment);
    const void* const block = Detail::IsMarked(pool, alignment) ? Detail::Unmarked(p) : p;
    EXPECT_EQ(pool.GetSize(block), taken) << size << ' ' << alignment;
    EXPECT_EQ(pool.Contains(p), alignment <= 4);
    resource.deallocate(p, size, alignment);
  };
  for (const auto& [size, alignment, wide, narrow] : cases)
    expect(size, alignment, sizeof(void*) == 8 ? wide : narrow);
  for (unsigned alignment = 1 << 13; alignment <= 1 << 24; alignment *= 2) // each bit of a shift
    expect(8, alignment, 2 * alignment);
  ExpectEmpty(pool);
}

/// Throws where too many live; checks its place, and that nothing else writes into it.
template <std::size_t N>
struct alignas(N) Part {
  static inline int living, limit;
  static inline bool isReverse; ///< they end in the reverse order of their beginning
  unsigned char bytes[N];

  Part() {
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(this) % N, 0U);
    if (living == limit) throw std::runtime_error("one too many");
    std::fill_n(bytes, N, static_cast<unsigned char>(++living));
  }
  Part(const Part&) : Part() {}
  ~Part() {
    EXPECT_EQ(std::count(bytes, bytes + N, bytes[0]), N);
    isReverse &= bytes[0] == living--;
  }
};

template <int>
struct Base {
  virtual ~Base() = default;
};

/// The tags of two modules name one pool.
template <bool on, int module>
struct Parts {
  static constexpr const char* name = on ? "parts" : "heap parts";
};
template <std::size_t N, bool on>
struct Bolt : Base<1>, Base<2>, Pooled<Bolt<N, on>, Parts<on, 1>> {
  Part<N> part;
};
template <std::size_t N, bool on>
struct Screw final : Bolt<1, on> {
  Part<N> more;
};
template <std::size_t N, bool on>
struct Nut final : Pooled<Nut<N, on>, Parts<on, 2>> {
  Part<N> part;
};

template <std::size_t N, bool on>
void MakeAll(Mgr& pool) {
  using P = Part<N>;
  using B = Bolt<N, on>;
  const std::function<void()> rows[] = {
      [&] { std::vector<P, Allocator<P>>(3, pool).resize(7); },
      [&] { std::list<P, Allocator<P>>(7, Allocator<P>(pool)); },
      [&] { MakeUnique<const P>(pool); },
      [&] {
        std::unique_ptr<const P[], Deleter<const P[]>> parts = MakeUnique<P[]>(pool, 3);
        parts = MakeUnique<P[]>(pool, 9);
        MakeUnique<P[]>(pool, 0);
      },
      [&] {
        P::isReverse = true;
        MakeUnique<const P[][2][3]>(pool, 2);
        EXPECT_TRUE(P::isReverse);
      },
      [&] {
        std::unique_ptr<Base<1>, Deleter<Base<1>>> base = MakeUnique<B>(pool);
        std::unique_ptr<const Base<2>, Deleter<const Base<2>>> second = MakeUnique<B>(pool);
        base = MakeUnique<B>(pool);
        EXPECT_EQ(&base.get_deleter().Pool(), &pool);
      },
      [] { delete new B; },
      [] { delete[] new B[3]; },
      [] { delete new (std::nothrow) B; },
      [] { delete[] new (std::nothrow) B[3]; },
      [] { delete new Nut<N, on>; },
      [] { delete static_cast<Bolt<1, on>*>(new Screw<N, on>); },
      [] {
        alignas(B) char place[sizeof(B)];
        (new (place) B)->~B();
      },
  };
  // Each row again with an exception at each part that it makes, then to its end.
  for (const auto& row : rows) {
    P::limit = 0;
    EXPECT_THROW(row(), std::runtime_error);
    while (++P::limit < 50)
      try {
        row();
      } catch (const std::runtime_error&) {
      }
    EXPECT_EQ(P::living, 0);
  }
  const auto numbers = MakeUnique<std::int16_t[][N]>(pool, N);
  EXPECT_EQ(numbers[N - 1][N - 1], 0);

  // What no expression calls.
  constexpr std::align_val_t alignment{N};
  B::operator delete(B::operator new(24), 24);
  B::operator delete[](B::operator new[](24), 24);
  B::operator delete(B::operator new(24, alignment), 24, alignment);
  B::operator delete[](B::operator new[](24, alignment), 24, alignment);
  EXPECT_EQ(B::operator new(2000000000, std::nothrow), nullptr);
  EXPECT_EQ(B::operator new[](2000000000, alignment, std::nothrow), nullptr);
  B::operator delete(nullptr);
  Deleter<P>{pool}(nullptr);
  Deleter<P[]>{pool}(static_cast<P*>(nullptr));
  EXPECT_EQ(GetMgr(Parts<on, 1>::name), (&Nut<N, on>::Pool()));
  ExpectEmpty(Nut<N, on>::Pool());
}

TEST(Adaptors, MakeAndDestroy) {
  const auto makeAll = []<int... n>(Mgr & pool, std::integer_sequence<int, n...>) {
    pool.IsEnabled() ? (MakeAll<1 << n, true>(pool), ...) : (MakeAll<1 << n, false>(pool), ...);
  };
  ForEachSetting([&](Mgr& pool) { makeAll(pool, std::make_integer_sequence<int, 7>()); });
}

TEST(Adaptors, RefuseWhatWouldEndTheProcess) {
  ForEachSetting([](Mgr& pool) {
    constexpr std::size_t limit = 1073741823;
    constexpr std::size_t most = SIZE_MAX;
    constexpr std::size_t requests[][2] = {
        {limit + 1, 1}, {limit - 7, 32}, {most, 8}, {most - 7, 64}, {1, most / 2 + 1}};
    for (const auto& [size, alignment] : requests)
      EXPECT_THROW(static_cast<void>(Resource(pool).allocate(size, alignment)), std::bad_alloc);
    Allocator<Part<32>> parts(pool);
    EXPECT_EQ(parts.max_size(), (limit - 35) / 32);
    EXPECT_THROW(parts.allocate(limit / 32), std::bad_alloc);
    EXPECT_THROW(parts.allocate(most / 32 + 1), std::bad_array_new_length);
    EXPECT_THROW(MakeUnique<Part<2>[]>(pool, most / 2), std::bad_array_new_length); // with a count
  });
}

template <class From, class To>
constexpr bool isAsStandard =
    std::is_convertible_v<Deleter<From>, Deleter<To>> ==
    std::is_convertible_v<std::default_delete<From>, std::default_delete<To>>;

TEST(Adaptors, CompareAndConvertAsTheStandardsDo) {
  Mgr a;
  Mgr b;
  EXPECT_TRUE(Allocator<int>(a) == Allocator<char>(a) && Allocator<int>(a) != Allocator<int>(b));
  EXPECT_TRUE(Resource(a).is_equal(Resource(a)) && !Resource(a).is_equal(Resource(b)) &&
              !Resource(a).is_equal(*std::pmr::new_delete_resource()));

  using A = Allocator<int>;
  static_assert(!A::is_always_equal::value);
  static_assert(!A::propagate_on_container_copy_assignment::value);
  static_assert(A::propagate_on_container_move_assignment::value);
  static_assert(A::propagate_on_container_swap::value);
  using D = Bolt<1, true>;
  static_assert(isAsStandard<D, Base<1>> && isAsStandard<Base<1>, D> && isAsStandard<const D, D>);
  static_assert(isAsStandard<D, D[]> && isAsStandard<D[], const D[]> && isAsStandard<D[], D>);
  static_assert(isAsStandard<D[][2], const D[][2]> && isAsStandard<D[], Base<1>[]>);
  static_assert(isAsStandard<D[][2], D[][3]> && isAsStandard<D[][2], D[]>);
  static_assert(!std::is_invocable_v<Deleter<Base<1>[]>, D*>);
  static_assert(sizeof(Allocator<D>) == sizeof(void*) && sizeof(Deleter<D>) == sizeof(void*));
}

} // namespace
