// What a test changes of its process: the settings and the locale.
#ifndef VOK_MEMPOOL_TESTS_PROCESS_H
#define VOK_MEMPOOL_TESTS_PROCESS_H

#include "MemPool"

#include <locale>
#include <map>
#include <sstream>
#include <string>

/// Sets what the text names: "bucket=4010 align=4 max=1000 min=8 keep=0 trace=0 on=0".
inline void Set(const std::string& words) {
  using namespace VOK::MemPool;
  static const std::map<std::string, void (*)(unsigned)> setters = {
      {"bucket", ZOR_VOK_MEMPOOL_BUCKET_SIZE},
      {"align", ZOR_VOK_MEMPOOL_DATA_ALIGNMENT},
      {"max", ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE},
      {"min", ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE},
      {"keep", [](unsigned n) { ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(n != 0); }},
      {"trace", [](unsigned n) { ZOR_VOK_MEMPOOL_TRACE(n != 0); }},
      {"on", [](unsigned n) { ZOR_VOK_MEMPOOL_ON(n != 0); }}};
  std::istringstream in(words);
  unsigned number = 0;
  for (std::string name; std::getline(in >> std::ws, name, '=') && in >> number;)
    setters.at(name)(number);
}

struct KeepSettings {
  ~KeepSettings() { Set("bucket=4010 align=4 max=1000 min=8 keep=0 trace=0 on=0"); }
};

inline bool dead = false; ///< locales and buffers of a test throw, as those of a program may

/// A locale that groups digits by these sizes and that no number was formed in yet.
inline std::locale Grouping(const char* sizes = "\1") {
  struct Format : std::numpunct<char> {
    explicit Format(const char* sizes_) : sizes(sizes_) {}
    char do_thousands_sep() const override { return '.'; }
    std::string do_grouping() const override { return dead ? throw 1 : sizes; }
    const char* const sizes;
  };
  return {std::locale::classic(), new Format(sizes)};
}

/// While it lives, the global locale groups digits.
struct GroupingLocale {
  ~GroupingLocale() { std::locale::global(before); }
  const std::locale before = std::locale::global(Grouping());
};

#endif
