#include "common/Files.h"

#include "common/Tool.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fmt/format.h>
#include <system_error>
#if defined(_WIN32)
#include <io.h>
#else
#include <unistd.h>
#endif

namespace VOK::MemPool::Tools {

namespace {

[[noreturn]] void Fail(std::string_view name, std::string_view what) {
  throw Failure(fmt::format("{}: {}: {}", name, what, std::strerror(errno)));
}

bool IsTerminal() {
#if defined(_WIN32)
  return _isatty(_fileno(stderr)) != 0;
#else
  return isatty(fileno(stderr)) != 0;
#endif
}

} // namespace

std::string NameOfFile(const std::string& path) { return path == "-" ? "standard input" : path; }

std::string ShortNameOfFile(const std::string& path) {
  return path == "-" ? NameOfFile(path) : std::filesystem::path(path).filename().string();
}

void Input::Closer::operator()(std::FILE* open) const {
  if (open != stdin) std::fclose(open);
}

Input::Input(const std::string& path)
    : name(NameOfFile(path)), file(path == "-" ? stdin : std::fopen(path.c_str(), "rb")) {
  if (file == nullptr) Fail(name, "can't be opened");
  std::error_code error;
  if (path != "-" && std::filesystem::is_regular_file(path, error)) {
    const auto bytes = std::filesystem::file_size(path, error);
    if (!error) size = bytes;
  }
}

std::size_t Input::Read(char* to, std::size_t count) {
  const std::size_t done = std::fread(to, 1, count, file.get());
  if (std::ferror(file.get()) != 0) Fail(name, "can't be read");
  return done;
}

std::string Input::ReadAll() {
  constexpr std::size_t least = 65536;
  std::string text;
  std::size_t length = 0;
  std::size_t done = 0;
  do {
    length += done;
    text.resize(std::max({2 * length, static_cast<std::size_t>(size) + 1, least}));
    done = Read(text.data() + length, text.size() - length);
  } while (done > 0);
  text.resize(length);
  return text;
}

Progress::Progress(std::uint64_t total_, const char* unit_, std::uint64_t scale_)
    : total(total_), unit(unit_), scale(scale_), isTerminal(IsTerminal()) {}

Progress::~Progress() {
  if (isShown) std::fputs("\r\x1b[K", stderr);
}

void Progress::Add(std::uint64_t units) {
  done += units;
  if (!isTerminal || Clock::now() < due) return;
  due = Clock::now() + std::chrono::milliseconds(200);
  isShown = true;
  Show();
}

void Progress::Show() const {
  constexpr std::uint64_t width = 40;
  if (total == 0) {
    fmt::print(stderr, "\r{} {} done\x1b[K", done / scale, unit);
    return;
  }
  const auto part = static_cast<std::size_t>(std::min(done, total) * width / total);
  fmt::print(stderr, "\r[{:<{}}] {} of {} {}\x1b[K", std::string(part, '#'), width, done / scale,
             total / scale, unit);
}

void Print(std::string_view text) {
  if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size())
    Fail("standard output", "can't be written");
}

void WriteFile(const std::string& path, std::string_view text) {
  if (path == "-") return Print(text);
  std::FILE* const file = std::fopen(path.c_str(), "wb");
  if (file == nullptr) Fail(path, "can't be opened");
  const bool isWritten = std::fwrite(text.data(), 1, text.size(), file) == text.size();
  if (std::fclose(file) != 0 || !isWritten) Fail(path, "can't be written");
}

std::string OneLine(std::string_view text) {
  std::string line;
  for (const char c : text)
    if (static_cast<unsigned char>(c) < ' ' || c == '\x7f')
      line += fmt::format("\\x{:02x}", static_cast<unsigned char>(c));
    else
      line += c;
  return line;
}

} // namespace VOK::MemPool::Tools
