#include "common/Progress.h"

#include <algorithm>
#include <cstdio>
#include <fmt/format.h>
#include <string>
#if defined(_WIN32)
#include <io.h>
#else
#include <unistd.h>
#endif

namespace VOK::MemPool::Tools {

namespace {

bool IsTerminal() {
#if defined(_WIN32)
  return _isatty(_fileno(stderr)) != 0;
#else
  return isatty(fileno(stderr)) != 0;
#endif
}

} // namespace

Progress::Progress(std::uint64_t total_) : total(total_), isTerminal(IsTerminal()) {}

Progress::~Progress() {
  if (isShown) std::fputs("\r\x1b[K", stderr);
}

void Progress::Add(std::uint64_t bytes) {
  done += bytes;
  if (!isTerminal || Clock::now() < due) return;
  due = Clock::now() + std::chrono::milliseconds(200);
  isShown = true;
  Show();
}

void Progress::Show() const {
  constexpr std::uint64_t width = 40;
  constexpr std::uint64_t mega = 1000000;
  if (total == 0) {
    fmt::print(stderr, "\r{} MB read\x1b[K", done / mega);
    return;
  }
  const auto part = static_cast<std::size_t>(std::min(done, total) * width / total);
  fmt::print(stderr, "\r[{:<{}}] {} of {} MB\x1b[K", std::string(part, '#'), width, done / mega,
             total / mega);
}

} // namespace VOK::MemPool::Tools
