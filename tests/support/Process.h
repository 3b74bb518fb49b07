// What a test changes of its process: the settings, the locale, the buffer of a stream. It includes
// what most tests use of the standard library.
#ifndef VOK_MEMPOOL_TESTS_PROCESS_H
#define VOK_MEMPOOL_TESTS_PROCESS_H

#include "MemPool"

#include <algorithm>
#include <cstring>
#include <functional>
#include <iostream>
#include <locale>
#include <map>
#include <memory>
#include <sstream>
#include <vector>

/// Sets what the text names.
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

/// The settings are the default ones again when it ends.
struct KeepSettings {
  static constexpr auto defaults = "bucket=4010 align=4 max=1000 min=8 keep=0 trace=0 on=0 ";
  ~KeepSettings() { Set(defaults); }
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

/// Replaces a stream's buffer while it lives, and ends by restoring the stream's whole state. The
/// stream throws what it can.
class Output : std::streambuf {
public:
  explicit Output(std::ostream& stream_ = std::cout) : stream(stream_) {
    format.copyfmt(stream);
    stream.exceptions(std::ios::badbit | std::ios::failbit);
    text.reserve(1000); // so that a few lines allocate nothing
  }
  ~Output() override {
    stream.copyfmt(format);
    stream.rdbuf(before);
  }
  /// What was written since the last call.
  std::string Text() {
    std::string written = text;
    text.clear();
    return written;
  }
  std::ptrdiff_t numFlushes = 0;

protected:
  int sync() override { return ++numFlushes, dead ? throw 1 : 0; }

private:
  void imbue(const std::locale&) override { text += "imbued"; }
  int_type overflow(int_type c) override { return text += dead ? throw 1 : char(c), c; }
  std::streamsize xsputn(const char* from, std::streamsize size) override {
    return text.append(dead ? throw 1 : from, std::size_t(size)), size;
  }

  std::ostream& stream;
  std::streambuf* const before = stream.rdbuf(this);
  std::ios format{nullptr};
  std::string text;
};

#endif
