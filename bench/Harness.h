// The main program of an allocator under test: it sets a workload up and runs it on demand.
//   lifo/SIZE/DEPTH          allocates DEPTH records over 4,000 live ones, frees them in reverse
//   single/SIZE              allocates and frees one record, with nothing else live
//   bulk/SIZE/COUNT/ORDER    allocates COUNT records and frees them in order, reverse or random
//   churn/LIVE               replaces one of LIVE records of realistic sizes
//   mixed/LIVE               the same with 2 % of 1 to 64 KiB
//   nodes/map, list, umap    inserts, looks up and erases 1,000 entries
//   clear/SIZE/COUNT         builds COUNT records and frees all of them at once
//   reset/SIZE/COUNT         the same by Reset; an allocator without it frees each
//   threads/COUNT            churn/2000 in COUNT threads, each with a pool of its own
//   shared/handover/SIZE     one thread allocates, another one frees
//   shared/exchange/LIVE     two threads replace LIVE records of realistic sizes, also each other's
//   shared/larson/LIVE       two threads replace LIVE records each, which the next two take over
//   replay/NAME TRACE        a recorded program, again and again in one process, its pool
//                            constructed and destroyed each time
//   fresh/NAME TRACE         the same, to be done once
//   resident/SIZE            memory: a million records
//   resident/NAME TRACE      memory: a recorded program at its peak
// It writes "ready", and answers each "go N" with the nanoseconds of N runs and a checksum:
// processor time, except for threads and shared. A memory workload writes its answer at once:
// payload, grown, left, checksum.
#ifndef VOK_BENCH_HARNESS_H
#define VOK_BENCH_HARNESS_H

#include "Nodes.h"
#include "Records.h"
#include "Replay.h"
#include "Resident.h"
#include "Shared.h"

#include <cstdint>
#include <cstdio>
#include <ctime>
#include <exception>
#include <iostream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace Bench {

inline std::int64_t Nanoseconds(clockid_t clock) {
  timespec now{};
  clock_gettime(clock, &now);
  return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

template <class Workload>
void Serve(Workload&& workload, clockid_t clock = CLOCK_PROCESS_CPUTIME_ID) {
  std::cout << "ready" << std::endl;
  std::string word;
  std::uint32_t times = 0;
  while (std::cin >> word >> times) {
    const std::int64_t start = Nanoseconds(clock);
    const std::uint32_t sum = workload.Run(times);
    std::cout << Nanoseconds(clock) - start << ' ' << sum << std::endl;
  }
}

inline void Answer(const Growth& growth) {
  std::cout << growth.payload << ' ' << growth.grown << ' ' << growth.left << ' ' << growth.sum
            << std::endl;
}

/// The words of a workload's name, followed by its trace.
class Request {
public:
  explicit Request(const std::vector<std::string>& arguments) {
    std::istringstream name(arguments.at(0));
    for (std::string word; std::getline(name, word, '/');)
      words.push_back(word);
    words.insert(words.end(), arguments.begin() + 1, arguments.end());
  }

  bool Is(const char* word, std::size_t count) const {
    return words.size() == count && words[0] == word;
  }
  const std::string& Text(std::size_t i) const { return words[i]; }
  std::uint32_t Number(std::size_t i) const {
    return static_cast<std::uint32_t>(std::stoul(words[i]));
  }

private:
  std::vector<std::string> words;
};

template <class Allocator>
concept ThreadSafe = Allocator::isThreadSafe;

/// False if there is no such workload.
template <ThreadSafe Allocator>
bool RunShared(const Request& ask) {
  if (ask.Text(1) == "handover")
    Serve(Handover<Allocator>(ask.Number(2)), CLOCK_MONOTONIC);
  else if (ask.Text(1) == "exchange")
    Serve(Exchange<Allocator>(ask.Number(2)), CLOCK_MONOTONIC);
  else if (ask.Text(1) == "larson")
    Serve(Larson<Allocator>(ask.Number(2)), CLOCK_MONOTONIC);
  else
    return false;
  return true;
}

/// False if there is no such workload.
template <class Allocator>
bool RunWorkload(const Request& ask) {
  if constexpr (ThreadSafe<Allocator>) {
    if (ask.Is("shared", 3)) return RunShared<Allocator>(ask);
  }
  constexpr std::uint32_t live = 4000;
  constexpr std::uint32_t large = 20;
  if (ask.Is("lifo", 3))
    Serve(Lifo<Allocator>(ask.Number(1), ask.Number(2), live));
  else if (ask.Is("single", 2))
    Serve(Lifo<Allocator>(ask.Number(1), 1, 0));
  else if (ask.Is("bulk", 4))
    Serve(Bulk<Allocator>(ask.Number(1), ask.Number(2), ask.Text(3)));
  else if (ask.Is("churn", 2))
    Serve(Churn<Allocator>(ask.Number(1), 0));
  else if (ask.Is("mixed", 2))
    Serve(Churn<Allocator>(ask.Number(1), large));
  else if (ask.Is("nodes", 2) && ask.Text(1) == "map")
    Serve(TreeNodes<Allocator>());
  else if (ask.Is("nodes", 2) && ask.Text(1) == "list")
    Serve(ListNodes<Allocator>());
  else if (ask.Is("nodes", 2) && ask.Text(1) == "umap")
    Serve(HashNodes<Allocator>());
  else if (ask.Is("clear", 3))
    Serve(Drop<Allocator>(ask.Number(1), ask.Number(2), false));
  else if (ask.Is("reset", 3))
    Serve(Drop<Allocator>(ask.Number(1), ask.Number(2), true));
  else if (ask.Is("threads", 2))
    Serve(Threads<Allocator>(ask.Number(1), 2000), CLOCK_MONOTONIC);
  else if (ask.Is("replay", 3) || ask.Is("fresh", 3))
    Serve(Replay<Allocator>(ask.Text(2)));
  else if (ask.Is("resident", 2))
    Answer(GrowthOfRecords<Allocator>(ask.Number(1)));
  else if (ask.Is("resident", 3))
    Answer(GrowthOfReplay<Allocator>(ask.Text(2)));
  else
    return false;
  return true;
}

template <class Allocator>
int Main(int argc, char** argv) {
  try {
    if ((argc == 2 || argc == 3) && RunWorkload<Allocator>(Request({argv + 1, argv + argc})))
      return 0;
    std::cerr << "usage: " << argv[0] << " WORKLOAD [TRACE], workloads as in bench/Harness.h\n";
    return 2;
  } catch (const std::invalid_argument& error) {
    std::cerr << argv[0] << ": bad number or order in the workload: " << error.what() << '\n';
    return 2;
  } catch (const std::exception& error) {
    std::cerr << argv[0] << ": " << error.what() << '\n';
    return 1;
  }
}

} // namespace Bench

#endif
