#include "record/Reader.h"

#include "common/Files.h"
#include "common/Tool.h"

#include <algorithm>
#include <fmt/format.h>
#include <memory>
#include <utility>
#include <zstd.h>

namespace VOK::MemPool::Tools {

namespace {

constexpr std::size_t fixedBytes = 4;

std::uint32_t LittleEndian(std::string_view bytes) {
  std::uint32_t number = 0;
  for (std::size_t i = fixedBytes; i-- > 0;)
    number = number << 8 | static_cast<unsigned char>(bytes[i]);
  return number;
}

} // namespace

Recording::Recording(std::string name_, Source source_)
    : name(std::move(name_)), source(std::move(source_)) {
  std::string opening(recordingMagic.size() + fixedBytes, 0);
  const std::size_t size = source(opening.data(), opening.size());
  if (size < opening.size() || !opening.starts_with(recordingMagic))
    throw Failure(fmt::format("{}: isn't a recording", name));
  const std::uint32_t version =
      LittleEndian(std::string_view(opening).substr(recordingMagic.size()));
  if (version != recordingVersion)
    throw Failure(fmt::format("{}: a recording of version {}; this program reads version {}", name,
                              version, recordingVersion));
}

bool Recording::Next(RecordedEvent& event) {
  while (!hasEnded) {
    while (at < block.size())
      if (TakeEntry(event)) {
        ++numEvents;
        return true;
      }
    if (!hasEnded && !ReadBlock()) isCut = hasEnded = true;
  }
  source = nullptr; // and with it the progress that it shows
  return false;
}

void Recording::Fail(std::string_view what) const {
  throw Failure(fmt::format("{}: after event {}: {}", name, numEvents, what));
}

/// False at the end and where the file is cut.
bool Recording::ReadBlock() {
  char sizes[2 * fixedBytes];
  if (source(sizes, sizeof sizes) < sizeof sizes) return false;
  const std::uint32_t size = LittleEndian({sizes, fixedBytes});
  const std::uint32_t plain = LittleEndian({sizes + fixedBytes, fixedBytes});
  if (std::max(size, plain) > mostBlockBytes) Fail("a block above the largest size");
  stored.resize(size);
  if (source(stored.data(), size) < size) return false;
  block.resize(plain);
  at = 0;
  const std::size_t got = ZSTD_decompress(block.data(), plain, stored.data(), size);
  if (ZSTD_isError(got) != 0) Fail(fmt::format("a damaged block: {}", ZSTD_getErrorName(got)));
  if (got != plain) Fail("a block shorter than it says");
  return true;
}

/// False if the entry isn't an event.
bool Recording::TakeEntry(RecordedEvent& event) {
  const auto kind = static_cast<Entry>(block[at++]);
  event = {.kind = kind};
  switch (kind) {
  case Entry::Malloc:
  case Entry::Calloc:
  case Entry::Aligned:
  case Entry::Realloc:
    if (kind == Entry::Realloc) event.old = TakeBlock();
    event.size = TakeNumber();
    event.stack = static_cast<std::uint32_t>(TakeNumber(stacks.size() - 1));
    if (kind == Entry::Aligned) event.alignmentLog = static_cast<std::uint8_t>(TakeNumber(63));
    event.block = ++lastBlock;
    break;
  case Entry::Free:
    event.block = TakeBlock();
    break;
  case Entry::FreeUnknown:
    break;
  default:
    TakeInformation(kind);
    return false;
  }
  event.thread = thread;
  event.time = time;
  return true;
}

void Recording::TakeInformation(Entry kind) {
  switch (kind) {
  case Entry::End:
    if (TakeNumber() != numEvents) Fail("an end that counts other events");
    numLost = TakeNumber();
    hasEnded = true;
    return;
  case Entry::Process:
    process = static_cast<std::int64_t>(TakeNumber());
    parent = static_cast<std::int64_t>(TakeNumber());
    TakeNumber(mostFrames);
    return;
  case Entry::Executable:
    executable = TakeText();
    return;
  case Entry::Command: {
    const std::string all = TakeText();
    command.clear();
    for (std::size_t begin = 0, end; begin < all.size(); begin = end + 1) {
      end = std::min(all.find('\0', begin), all.size());
      command.push_back(all.substr(begin, end - begin));
    }
    return;
  }
  case Entry::Unload:
    loading.clear();
    isLoading = true;
    return;
  case Entry::Module: {
    const std::uint64_t address = TakeNumber();
    auto& list = isLoading ? loading : modules.back(); // another thread's stack may come between
    list.push_back({address, TakeText()});
    return;
  }
  case Entry::Stack:
    return TakeStack();
  case Entry::Thread:
    thread = static_cast<std::uint32_t>(TakeNumber(0xffff));
    return;
  case Entry::Time:
    time += TakeNumber(~time);
    return;
  default:
    Fail(fmt::format("an entry of unknown kind {}", static_cast<unsigned>(kind)));
  }
}

std::uint64_t Recording::TakeNumber(std::uint64_t most) {
  std::uint64_t number = 0;
  for (unsigned shift = 0; shift < 64; shift += 7) {
    if (at == block.size()) Fail("an entry without its end");
    const auto byte = static_cast<unsigned char>(block[at++]);
    number |= static_cast<std::uint64_t>(byte & 0x7f) << shift;
    if ((byte & 0x80) == 0) {
      if (number > most) Fail(fmt::format("the number {} where {} is the largest", number, most));
      return number;
    }
  }
  Fail("a number above 64 bits");
}

std::string Recording::TakeText() {
  const std::uint64_t size = TakeNumber(std::min<std::uint64_t>(mostText, block.size() - at));
  if (size > block.size() - at) Fail("a text without its end");
  std::string text = block.substr(at, size);
  at += size;
  return text;
}

std::uint64_t Recording::TakeBlock() {
  if (lastBlock == 0) Fail("a block before the first one");
  return lastBlock - TakeNumber(lastBlock - 1);
}

void Recording::TakeStack() {
  EndModules();
  RecordedStack stack{.frames = {}, .modules = modules.size() - 1};
  const std::uint64_t count = TakeNumber(mostFrames);
  std::uint64_t frame = 0;
  for (std::uint64_t i = 0; i < count; ++i) {
    const std::uint64_t zigzag = TakeNumber();
    frame += (zigzag >> 1) ^ (0 - (zigzag & 1));
    stack.frames.push_back(frame);
  }
  stacks.push_back(std::move(stack));
}

/// A list that only adds to the one before replaces it, and serves the stacks of both.
void Recording::EndModules() {
  if (!std::exchange(isLoading, false)) return;
  const bool isMore = std::ranges::all_of(modules.back(), [&](const RecordedModule& module) {
    return std::ranges::find(loading, module) != loading.end();
  });
  if (isMore)
    modules.back() = std::move(loading);
  else
    modules.push_back(std::move(loading));
  loading.clear();
}

Recording OpenRecording(const std::string& path, const std::string& name) {
  const auto input = std::make_shared<Input>(path);
  const auto progress = std::make_shared<Progress>(input->GetSize());
  return {name, [=](char* to, std::size_t size) {
            const std::size_t read = input->Read(to, size);
            progress->Add(read);
            return read;
          }};
}

} // namespace VOK::MemPool::Tools
