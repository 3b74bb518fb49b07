#include "support/Script.h"

#include "engine/Bucket.h"
#include "engine/BucketMgr.h"
#include "engine/ExtRec.h"
#include "engine/Group.h"
#include "engine/Invariants.h"
#include "services/MgrRegistry.h"
#include "services/Observers.h"

#include <algorithm>
#include <cstring>
#include <gtest/gtest.h>
#include <iostream>
#include <regex>

using namespace VOK::MemPool;

namespace {

// The arm of <A|B> for this width.
std::string Choose(const std::string& text) {
  if (text.find('<') == std::string::npos) return text;
  static const std::regex either("<([^|<>\n]*)\\|([^|<>\n]*)>");
  return std::regex_replace(text, either, sizeof(void*) == 4 ? "$1" : "$2");
}

std::string YesNo(bool b) { return b ? "true" : "false"; }

std::string Next(std::istream& words) {
  std::string word;
  words >> word;
  return word;
}

// Runs a call of the library on the arena.
template <class Call>
auto OnArena(const Call& call) {
  const ArenaHeap::Use use;
  return call();
}

// What - and "" stand for, and any other name.
const char* TextOf(const std::string& word) {
  return word == "-" ? nullptr : word == "\"\"" ? "" : word.c_str();
}

// By ascending name, as both forms of GetMgrs must give them.
std::string AllMgrs() {
  VOK::vector<Mgr*> mgrs;
  std::vector<Mgr*> standard;
  OnArena([&] { GetMgrs(mgrs), GetMgrs(standard); });
  std::string text = std::to_string(GetNumMgrs());
  for (const Mgr* mgr : mgrs)
    text += std::string(" ") + mgr->GetName();
  const bool same = std::equal(mgrs.begin(), mgrs.end(), standard.begin(), standard.end());
  return text + (same ? "" : ", two answers");
}

// The calls that mayn't take anything from the heap.
const std::map<std::string, std::string (*)(Mgr&, void*)> quietCalls = {
    {"free", [](Mgr& pool, void* p) { return YesNo(pool.Free(p)); }},
    {"size", [](Mgr& pool, void* p) { return std::to_string(pool.GetSize(p)); }},
    {"has", [](Mgr& pool, void* p) { return YesNo(pool.Contains(p)); }},
    {"gc", [](Mgr& pool, void*) { return YesNo(pool.CollectGarbage()); }},
    {"enabled", [](Mgr& pool, void*) { return YesNo(pool.IsEnabled()); }},
    {"clear", [](Mgr& pool, void*) { return pool.Clear(), std::string(); }},
    {"drop", [](Mgr& pool, void*) { return delete &pool, std::string(); }}};

struct Grouping : std::numpunct<char> {
  char do_thousands_sep() const override { return '.'; }
  std::string do_grouping() const override { return "\1"; }
};

std::uint8_t otherPlace[64];

} // namespace

KeepSettings::KeepSettings()
    : bucketSize(ZOR_VOK_MEMPOOL_BUCKET_SIZE()), dataAlignment(ZOR_VOK_MEMPOOL_DATA_ALIGNMENT()),
      maxRecordSize(ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE()),
      minRecordSize(ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE()),
      keepEmptyBuckets(ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS()), trace(ZOR_VOK_MEMPOOL_TRACE()),
      on(ZOR_VOK_MEMPOOL_ON()) {}

KeepSettings::~KeepSettings() {
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(bucketSize);
  ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(dataAlignment);
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(maxRecordSize);
  ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(minRecordSize);
  ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(keepEmptyBuckets);
  ZOR_VOK_MEMPOOL_TRACE(trace);
  ZOR_VOK_MEMPOOL_ON(on);
}

void Set(std::istream& words) {
  static const std::map<std::string, void (*)(unsigned)> setters = {
      {"bucket", ZOR_VOK_MEMPOOL_BUCKET_SIZE},
      {"align", ZOR_VOK_MEMPOOL_DATA_ALIGNMENT},
      {"max", ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE},
      {"min", ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE},
      {"keep", [](unsigned n) { ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(n != 0); }},
      {"on", [](unsigned n) { ZOR_VOK_MEMPOOL_ON(n != 0); }},
      {"trace", [](unsigned n) { ZOR_VOK_MEMPOOL_TRACE(n != 0); }}};
  for (std::string word; words >> word;) {
    const std::size_t equals = word.find('=');
    setters.at(word.substr(0, equals))(
        static_cast<unsigned>(std::stoul(word.substr(equals + 1), nullptr, 0)));
  }
}

void Set(const std::string& words) {
  std::istringstream in(words);
  Set(in);
}

CaughtOutput::CaughtOutput(std::function<void()> atLine_)
    : atLine(std::move(atLine_)), buffer(std::cout.rdbuf(this)), flags(std::cout.flags()) {}

CaughtOutput::~CaughtOutput() {
  std::cout.rdbuf(buffer);
  std::cout.flags(flags);
}

std::string CaughtOutput::Take() { return std::exchange(text, {}); }

CaughtOutput::int_type CaughtOutput::overflow(int_type c) {
  const ArenaHeap::Use real(false);
  text += traits_type::to_char_type(c);
  if (c == '\n') atLine();
  return c;
}

GroupingLocale::GroupingLocale()
    : before(std::locale::global(std::locale(std::locale::classic(), new Grouping))) {}

GroupingLocale::~GroupingLocale() { std::locale::global(before); }

std::string Script::Run(const std::string& text) {
  std::string transcript;
  std::istringstream lines(Choose(text));
  for (std::string line; std::getline(lines, line);) {
    if (line.starts_with(' ')) continue;
    std::string below;
    for (std::size_t from = 0, end = 0; end != std::string::npos; from = end + 2) {
      end = line.find("; ", from);
      const std::string step = line.substr(from, end == std::string::npos ? end : end - from);
      transcript += (from > 0 ? "; " : "") +
                    Step(step.substr(0, std::min(step.find(" -> "), step.find(" : "))), below);
    }
    transcript += "\n" + below;
  }
  return transcript;
}

std::string Script::Step(const std::string& command, std::string& below) {
  std::string result;
  heap.events.clear();
  std::istringstream words(command);
  try {
    result = Command(words);
  } catch (const std::bad_alloc&) {
    result = "bad_alloc";
    heap.FailAt(0);
  }
  const std::string written = output.Take();
  for (const auto& [name, pool] : pools)
    if (!IsValid(*pool->GetBucketMgr())) below += "  " + name + " is not valid\n";
  if (retries && result == "bad_alloc") {
    // A pool may have told of its making, and then it tells of it once more.
    if (!command.starts_with("pool") && !written.empty()) below += "  in vain: " + written;
    return Step(command, below);
  }
  std::istringstream lines(written);
  for (std::string line; std::getline(lines, line);)
    below += "  |" + (isRaw ? line : WithNames(line)) + "\n";
  const bool showsHeap = tellsHeap && !heap.events.empty();
  return command + (result.empty() ? "" : " -> " + result) + (showsHeap ? " :" + HeapEvents() : "");
}

std::string Script::Command(std::istream& words) {
  const std::string op = Next(words);
  if (op.empty() || op == "#") return "";
  if (op == "set") return Set(words), "";
  if (op == "heap") return tellsHeap = !tellsHeap, "";
  if (op == "raw") return isRaw = true, "";
  if (op == "hex") return std::cout << std::hex << std::showbase << std::uppercase, "";
  if (op == "end") return MgrRegistry::End(), "";
  if (op == "mgrs") return AllMgrs();
  const std::string name = Next(words);
  if (op == "get") return Found(OnArena([&] { return GetMgr(TextOf(name)); }));
  if (op == "pool") return Make(name, Next(words)), "";
  if (op == "fail")
    return heap.FailAt(static_cast<unsigned>(std::stoul(name)), !Next(words).empty()), "";

  Mgr& pool = Pool(name);
  if (op == "show") return Show(pool);
  if (op == "name") return pool.GetName();
  const std::string operand = Next(words);
  if (op == "alloc") return Alloc(pool, operand, Next(words));
  std::uint8_t* const p = operand.empty() ? nullptr : Pointer(operand);
  const unsigned numCalls = heap.numCalls;
  const std::string result = OnArena([&] { return quietCalls.at(op)(pool, p); });
  if (op == "drop") pools.erase(name);
  return heap.numCalls == numCalls ? result : "takes from the heap";
}

void Script::Make(const std::string& name, const std::string& given) {
  const char* const text = TextOf(given.empty() ? name : given);
  Mgr* const mgr = OnArena([&] { return new Mgr(text); });
  pools[name] = mgr;
  names[reinterpret_cast<std::uintptr_t>(mgr->GetBucketMgr())] = name;
}

std::string Script::Alloc(Mgr& pool, const std::string& name, const std::string& number) {
  const auto size = static_cast<std::uint32_t>(std::stoul(number, nullptr, 0));
  auto* const p = static_cast<std::uint8_t*>(OnArena([&] { return pool.Alloc(size); }));
  std::memset(p, 0x5A, size);
  pointers[name] = p;
  names[reinterpret_cast<std::uintptr_t>(p)] = name;
  const Observers::Quiet looking;
  Bucket* const bucket = pool.GetBucketMgr()->FindBucket(p);
  if (bucket == nullptr) return pool.IsEnabled() ? "ext" : "heap";
  return Name(bucket) + "+" + std::to_string(Rec::FromData(p)->Offset());
}

std::string Script::Found(const Mgr* found) const {
  for (const auto& [name, mgr] : pools)
    if (mgr == found) return name;
  return found == nullptr ? "null" : "a handle of nobody";
}

Script::Script() : output([this] { heap.events.push_back({'|', {}, 0, nullptr}); }) {
  heap.watch = [this](const ArenaHeap::Event& event) { buckets.erase(event.block); };
}

Script::~Script() {
  const ArenaHeap::Use use;
  for (const auto& [name, pool] : pools)
    delete pool;
}

std::string Script::Finish() {
  while (!pools.empty())
    Run("drop " + pools.begin()->first);
  std::string text;
  for (const std::string& fault : heap.Finish())
    text += fault + "\n";
  return text;
}

std::uint8_t* Script::Pointer(const std::string& name) const {
  if (name == "null") return nullptr;
  const std::size_t plus = name.find('+');
  if (plus != std::string::npos)
    return Pointer(name.substr(0, plus)) + std::stoul(name.substr(plus + 1));
  return name == "other" ? otherPlace + sizeof otherPlace / 2 : pointers.at(name);
}

std::string Script::Show(Mgr& pool) {
  const Observers::Quiet looking;
  const BucketMgr& mgr = *pool.GetBucketMgr();
  std::string text;
  for (std::uint32_t i = 0; i < mgr.numGroups; ++i) {
    const Group* const group = mgr.groups[i];
    if (group == nullptr) continue;
    text += (text.empty() ? "[" : ", [") + std::to_string(i) + "] " +
            std::to_string(group->dataSize) + ":";
    for (Bucket* b = group->head1; b != nullptr; b = b->next1)
      text += " " + Chain(*b);
    text += " free";
    for (const Bucket* b = group->head2; b != nullptr; b = b->next2)
      text += " " + Name(b);
    text += " tail " + Name(group->tail1);
  }
  if (mgr.extRecs != nullptr) text += text.empty() ? "ext" : ", ext";
  for (const ExtRec* e = mgr.extRecs; e != nullptr; e = e->next)
    text += " " + std::to_string(e->length);
  return text.empty() ? "nothing" : text;
}

std::string Script::Chain(Bucket& bucket) {
  std::string text;
  for (std::uint16_t o = bucket.freeHead; o != 0; o = bucket.RecAt(o)->Offset())
    text += (text.empty() ? "" : " ") + std::to_string(o);
  return Name(&bucket) + "(" + text + ")";
}

std::string Script::Name(const Bucket* bucket) {
  if (bucket == nullptr) return "-";
  const auto [place, isNew] = buckets.try_emplace(bucket, numBuckets + 1);
  if (isNew) ++numBuckets;
  return "#" + std::to_string(place->second);
}

// An address of the arena, of the full number of digits, becomes {its name}.
std::string Script::WithNames(const std::string& text) const {
  static const std::regex address("[0-9a-f]{" + std::to_string(sizeof(void*) == 4 ? 8 : 12) + "}");
  std::string named;
  std::sregex_iterator match(text.begin(), text.end(), address);
  auto from = text.begin();
  for (; match != std::sregex_iterator(); ++match) {
    const auto value = static_cast<std::uintptr_t>(std::stoull(match->str(), nullptr, 16));
    if (!ArenaHeap::Holds(value)) continue;
    const auto name = names.find(value);
    named.append(from, (*match)[0].first);
    named += "{" + (name != names.end() ? name->second : "?") + "}";
    from = (*match)[0].second;
  }
  return named.append(from, text.end());
}

// Objects of a known kind by its name, what the standard library takes for itself as "std".
std::string Script::HeapEvents() const {
  std::string text;
  for (const ArenaHeap::Event& event : heap.events) {
    text += std::string(" ") + event.kind;
    if (event.kind == '|') continue;
    if (event.form == ArenaHeap::Form::Array)
      text += "[" + std::to_string(event.size) + "]";
    else
      text += event.size == sizeof(BucketMgr) ? "BucketMgr"
              : event.size == sizeof(Group)   ? "Group"
              : event.size == sizeof(Mgr)     ? "Mgr"
                                              : "std";
  }
  return text;
}

void Expect(const std::string& text, const char* file, int line) {
  const testing::ScopedTrace trace(file, line, "script");
  Script script;
  const std::string wanted = Choose(text.substr(text.starts_with('\n') ? 1 : 0));
  EXPECT_EQ(script.Run(wanted), wanted);
  EXPECT_EQ(script.Finish(), "");
}
