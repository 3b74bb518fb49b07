// vokmempool top: the pools of a process by what they hold, again and again. A round reads the
// counters of each pool; records are counted for one pool alone, when it is asked for.
// Test: tests/tools/top_test.py.
#include "common/Files.h"
#include "common/Numbers.h"
#include "common/Tool.h"
#include "inspect/Library.h"
#include "inspect/Pools.h"
#include "inspect/Screen.h"
#include "inspect/Walk.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <deque>
#include <fmt/format.h>
#include <map>
#include <memory>
#include <thread>

namespace VOK::MemPool::Tools {

namespace {

using Clock = std::chrono::steady_clock;

struct Options {
  int process = 0, batch = 0;
  double every = 1;
};

/// What a pool holds at a moment.
struct Counters {
  std::uint64_t held = 0, peak = 0, buckets = 0;
};

struct Row {
  PoolPlace place;
  const Library* library;
  Counters now;
  std::int64_t growth; ///< of the bytes held, since the first round
  std::int64_t recent; ///< over the last seconds
};

class PoolTable {
public:
  explicit PoolTable(int process)
      : memory(MemoryOfProcess(process)), libraries(FindLibraries(memory)) {
    if (libraries.empty()) throw Failure("it has no libVokMemPool 1.1 or later");
  }

  /// A round. Fails once the process has ended.
  std::vector<Row> Read() {
    constexpr auto span = std::chrono::seconds(5);
    const auto now = Clock::now();
    std::vector<Row> rows;
    Held held;
    for (const Library& library : libraries)
      for (const PoolPlace& place : ListPools(library))
        if (const auto counters = ReadCounters(library, place.pool)) {
          held[place.pool] = counters->held;
          rows.push_back({place, &library, *counters, 0, 0});
        }
    rounds.emplace_back(now, held);
    while (rounds.size() > 2 && now - rounds[1].first >= span)
      rounds.pop_front();
    first.merge(held); // a pool that is new counts from its first round
    for (Row& row : rows) {
      const auto before = rounds.front().second.find(row.place.pool);
      row.growth = Change(first.at(row.place.pool), row.now.held);
      row.recent = Change(before == rounds.front().second.end() ? 0 : before->second, row.now.held);
    }
    return rows;
  }

private:
  using Held = std::map<std::uint64_t, std::uint64_t>; ///< bytes by the pool's address

  static std::int64_t Change(std::uint64_t before, std::uint64_t now) {
    return static_cast<std::int64_t>(now - before);
  }

  static std::optional<Counters> ReadCounters(const Library& library, std::uint64_t pool) {
    const auto& fields = library.layout.structures.budget;
    const auto read = [&](std::uint32_t offset) -> std::optional<std::uint64_t> {
      const auto copy = library.Fetch(pool + offset, sizeof(std::uint64_t));
      if (!copy) return std::nullopt;
      return copy->Get<std::uint64_t>(0);
    };
    const auto held = read(fields.held);
    const auto peak = read(fields.peak);
    const auto buckets = read(fields.buckets);
    if (!held || !peak || !buckets) return std::nullopt;
    return Counters{*held, *peak, *buckets};
  }

  const Memory memory;
  const std::vector<Library> libraries;
  Held first;
  std::deque<std::pair<Clock::time_point, Held>> rounds; ///< the last seconds
};

enum class Order : char { Name = 'n', Held = 'h', Growth = 'g', Recent = 'r', Buckets = 'b' };

void Sort(std::vector<Row>& rows, Order order) {
  std::ranges::stable_sort(rows, {}, [](const Row& row) { return row.place.name; });
  const auto by = [&](auto key) { std::ranges::stable_sort(rows, std::ranges::greater(), key); };
  switch (order) {
  case Order::Name:
    break;
  case Order::Held:
    return by([](const Row& row) { return row.now.held; });
  case Order::Growth:
    return by([](const Row& row) { return row.growth; });
  case Order::Recent:
    return by([](const Row& row) { return row.recent; });
  case Order::Buckets:
    return by([](const Row& row) { return row.now.buckets; });
  }
}

constexpr auto form = "{:<24} {:>14} {:>14} {:>14} {:>14} {:>9}";

std::string Headings() {
  return fmt::format(form, "pool", "bytes held", "since start", "last 5 s", "peak", "buckets");
}

std::string TextOf(const Row& row) {
  return fmt::format(form, OneLine(row.place.name), row.now.held, fmt::format("{:+}", row.growth),
                     fmt::format("{:+}", row.recent), row.now.peak, row.now.buckets);
}

std::string TitleOf(const std::vector<Row>& rows, int process) {
  std::uint64_t held = 0;
  for (const Row& row : rows)
    held += row.now.held;
  return fmt::format("process {}: {} pool{}, {} bytes held", process, rows.size(),
                     rows.size() == 1 ? "" : "s", held);
}

void PrintRounds(PoolTable& table, const Options& options) {
  for (int i = 0; i < options.batch; ++i) {
    if (i > 0) std::this_thread::sleep_for(std::chrono::duration<double>(options.every));
    std::vector<Row> rows = table.Read();
    Sort(rows, Order::Held);
    Print(TitleOf(rows, options.process) + "\n" + Headings() + "\n");
    for (const Row& row : rows)
      Print(TextOf(row) + "\n");
    std::fflush(stdout);
  }
}

constexpr auto classForm = "{:>12} {:>12} {:>12} {:>12}";

/// The size classes of a pool, which this counts.
std::vector<std::string> ClassesOf(const Row& row) {
  struct Figures {
    std::uint64_t used = 0, free = 0, buckets = 0;
  };
  std::map<Number, Figures> classes;
  const Report report = WalkPool(*row.library, row.place.pool, row.place.name, false).report;
  for (const BucketRow& bucket : report.buckets.rows) {
    Figures& figures = classes[bucket.recSize];
    figures.used += bucket.used;
    figures.free += bucket.free;
    ++figures.buckets;
  }
  std::vector<std::string> rows;
  rows.reserve(classes.size() + 1);
  for (const auto& [size, figures] : classes)
    rows.push_back(fmt::format(classForm, size, figures.used, figures.free, figures.buckets));
  rows.push_back(fmt::format(classForm, "ext", report.extRecs.rows.size(), "", ""));
  return rows;
}

/// The table, and on Enter the size classes of the selected pool.
class View {
public:
  View(PoolTable& table_, const Options& options_) : table(table_), options(options_) {}

  void Run() {
    Screen screen;
    for (bool isQuit = false; !isQuit;) {
      std::vector<Row> rows = table.Read();
      Sort(rows, order);
      // The selection stays with its pool while the rows change places.
      const auto found = std::ranges::find(rows, pool, [](const Row& r) { return r.place.pool; });
      if (found != rows.end()) selected = static_cast<std::size_t>(found - rows.begin());
      selected = std::min(selected, rows.empty() ? 0 : rows.size() - 1);
      pool = rows.empty() ? 0 : rows[selected].place.pool;
      Draw(screen, rows);
      isQuit = Act(screen, rows);
    }
  }

private:
  void Draw(Screen& screen, const std::vector<Row>& rows) {
    isInPool = isInPool && !rows.empty();
    if (isInPool) {
      screen.Draw(fmt::format("pool {}", OneLine(rows[selected].place.name)),
                  fmt::format(classForm, "record size", "used", "free", "buckets"),
                  ClassesOf(rows[selected]), 0, "Esc back  q quit");
      return;
    }
    std::vector<std::string> lines(rows.size());
    std::ranges::transform(rows, lines.begin(), TextOf);
    screen.Draw(
        TitleOf(rows, options.process), Headings(), lines, selected,
        "Enter size classes  sort by: n name  h held  g growth  r recent  b buckets  q quit");
  }

  /// True to quit.
  bool Act(Screen& screen, const std::vector<Row>& rows) {
    char letter = ' ';
    const auto select = [&](std::size_t row) { pool = rows.empty() ? 0 : rows[row].place.pool; };
    const std::size_t last = rows.empty() ? 0 : rows.size() - 1;
    switch (screen.Wait(options.every, letter)) {
    case Screen::Key::Up:
      select(selected > 0 ? selected - 1 : 0);
      break;
    case Screen::Key::Down:
      select(std::min(selected + 1, last));
      break;
    case Screen::Key::Top:
      select(0);
      break;
    case Screen::Key::Bottom:
      select(last);
      break;
    case Screen::Key::Enter:
      isInPool = !isInPool;
      break;
    case Screen::Key::Back:
      isInPool = false;
      break;
    case Screen::Key::Quit:
      return true;
    case Screen::Key::Other:
      if (std::string_view("nhgrb").find(letter) != std::string_view::npos)
        order = static_cast<Order>(letter);
      break;
    case Screen::Key::None:
      break;
    }
    return false;
  }

  PoolTable& table;
  const Options& options;
  Order order = Order::Held;
  std::uint64_t pool = 0; ///< the address of the selected one
  std::size_t selected = 0;
  bool isInPool = false;
};

void Run(const Options& options) {
  try {
    PoolTable table(options.process);
    if (options.batch > 0)
      PrintRounds(table, options);
    else
      View(table, options).Run();
  } catch (const Failure& failure) {
    throw Failure(fmt::format("{}: {}", options.process, failure.what()));
  }
}

} // namespace

void AddTop(CLI::App& app) {
  const auto options = std::make_shared<Options>();
  CLI::App* const command =
      app.add_subcommand("top", "Shows the pools of a process by what they hold, live");
  command->add_option("PID", options->process, "the process")
      ->required()
      ->check(NumberFrom(1, INT32_MAX, "the number of a process"));
  command->add_option("--batch", options->batch, "print so many rounds in place of a live table")
      ->check(NumberFrom(1, INT32_MAX, "a number of rounds"));
  command->add_option("--every", options->every, "seconds from round to round")
      ->check(NumberFrom(0.01, 86400.0, "seconds"));
  command->footer("Example: which pool grows, and which of its sizes?\n"
                  "  vokmempool top $(pidof program)");
  command->callback([options] { Run(*options); });
}

} // namespace VOK::MemPool::Tools
