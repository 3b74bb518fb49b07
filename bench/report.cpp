// What a report costs, compared with its two unavoidable parts: one pass over the headers of all
// records, and as many flushed lines of the same length. All write to a file; each figure is a
// median.
//   plain      Mgr::Dbg of a pool of 1,000,000 used records of 24 bytes
//   headers    one read of each record's type byte, in the order of addresses
//   lines      the report's own lines, written and flushed one by one
//   detailed   Mgr::DbgDetailed of a pool of 100,000 such records, per record
#include <MemPool>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <iostream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

using VOK::MemPool::Mgr;

constexpr int rounds = 9;

/// Sends standard output into a buffer for as long as it lives.
class Redirection {
public:
  explicit Redirection(std::streambuf& to) : before(std::cout.rdbuf(&to)) {}
  ~Redirection() { std::cout.rdbuf(before); }
  Redirection(const Redirection&) = delete;
  Redirection& operator=(const Redirection&) = delete;

private:
  std::streambuf* before;
};

template <class Work>
double Seconds(Work work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

template <class Work>
double SecondsToFile(const std::string& path, Work work) {
  std::filebuf file;
  if (!file.open(path, std::ios::out | std::ios::trunc))
    throw std::runtime_error("cannot open " + path);
  const Redirection redirection(file);
  const double seconds = Seconds(work);
  if (!std::cout.good()) throw std::runtime_error("cannot write " + path);
  return seconds;
}

double Median(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  return values[values.size() / 2];
}

std::vector<std::string> ReportLines(const Mgr& pool) {
  std::stringbuf text;
  {
    const Redirection redirection(text);
    pool.Dbg();
  }
  std::vector<std::string> lines;
  std::istringstream in(text.str());
  for (std::string line; std::getline(in, line);)
    lines.push_back(line);
  return lines;
}

std::vector<unsigned char*> Fill(Mgr& pool, int records) {
  std::vector<unsigned char*> data(static_cast<std::size_t>(records));
  for (unsigned char*& p : data)
    p = static_cast<unsigned char*>(pool.Alloc(24));
  std::sort(data.begin(), data.end());
  return data;
}

void Measure(const std::string& path) {
  VOK::MemPool::ZOR_VOK_MEMPOOL_ON(true);
  Mgr large("large");
  Mgr small("small");
  const auto data = Fill(large, 1000000);
  const int smallRecords = 100000;
  Fill(small, smallRecords);
  const auto lines = ReportLines(large);

  std::vector<double> plain;
  std::vector<double> headers;
  std::vector<double> written;
  std::vector<double> detailed;
  std::uint64_t used = 0;
  for (int round = 0; round < rounds; ++round) {
    plain.push_back(SecondsToFile(path, [&] { large.Dbg(); }));
    headers.push_back(Seconds([&] {
      for (const unsigned char* p : data)
        used += p[-2];
    }));
    written.push_back(SecondsToFile(path, [&] {
      for (const std::string& line : lines)
        std::cout << line << std::endl;
    }));
    detailed.push_back(SecondsToFile(path, [&] { small.DbgDetailed(); }));
  }
  std::remove(path.c_str());
  if (used != std::uint64_t{1000000} * rounds)
    throw std::runtime_error("the pass met " + std::to_string(used) + " used records");
  const double floor = Median(headers) + Median(written);
  std::printf("plain    %8.2f ms, %zu lines\n", Median(plain) * 1e3, lines.size());
  std::printf("headers  %8.2f ms\n", Median(headers) * 1e3);
  std::printf("lines    %8.2f ms\n", Median(written) * 1e3);
  std::printf("plain / (headers + lines) %.2f\n", Median(plain) / floor);
  std::printf("detailed %8.2f us a record\n", Median(detailed) / smallRecords * 1e6);
}

} // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: report FILE\n");
    return 2;
  }
  try {
    Measure(argv[1]);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "report: %s\n", error.what());
    return 1;
  }
}
