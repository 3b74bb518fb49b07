// A program that lives on the library.
#include "Script.h"

#include <MemPool>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <new>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace {

using namespace VOK::MemPool;

// Never destroyed, so that a leak checker finds in them what stands at the end.
auto& pools = *new std::vector<Mgr*>;
auto& blocks = *new std::vector<void*>;

// Filled while the library loads, ahead of any constructor of this program.
const char* lookups[16];
std::size_t numLookups;

unsigned Number(const std::string& text) { return static_cast<unsigned>(std::stoul(text)); }

void Drop(const std::string&) {
  delete pools.back();
  pools.pop_back();
}

void Alloc(const std::string& size) {
  void* block = nullptr;
  try {
    block = pools.back()->Alloc(Number(size));
  } catch (const std::bad_alloc&) {
    Say("bad_alloc");
  }
  blocks.push_back(block);
}

void Free(const std::string&) {
  Say(pools.back()->Free(blocks.back()) ? "freed" : "refused");
  blocks.pop_back();
}

// Each pool but the last is destroyed before the next one is made.
void MakeNameless(const std::string& count) {
  for (unsigned n = Number(count); n > 0; --n) {
    pools.push_back(new Mgr);
    if (n > 1) Drop("");
  }
}

void ShowNames(const std::string&) {
  std::vector<Mgr*> mgrs;
  GetMgrs(mgrs);
  std::string text = std::to_string(GetNumMgrs()) + " pools:";
  for (const Mgr* mgr : mgrs)
    text += std::string(" ") + mgr->GetName();
  Say(text);
}

// A vector at the end of its range takes no more: an exception of the library's own code.
void Overfill(const std::string&) {
  VOK::vector<Mgr*> mgrs;
  mgrs.count = mgrs.capacity = 1U << 31;
  try {
    GetMgrs(mgrs);
  } catch (const std::bad_alloc&) {
    Say("bad_alloc");
  }
}

// Ends with a pool built under the switches alone, so that no size can stop it.
void ShowSettings(const std::string&) {
  std::string text;
  for (const unsigned value :
       {ZOR_VOK_MEMPOOL_BUCKET_SIZE(), ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(),
        ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(), ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE()})
    text += std::to_string(value) + " ";
  for (const bool value : {ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(), ZOR_VOK_MEMPOOL_TRACE(),
                           ZOR_VOK_MEMPOOL_ON(), ZOR_VOK_MEMPOOL_OFF()})
    text += value ? "1 " : "0 ";
  ZOR_VOK_MEMPOOL_BUCKET_SIZE(4010);
  ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(4);
  ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(1000);
  ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(8);
  ZOR_VOK_MEMPOOL_TRACE(false);
  Say(text + (Mgr("shown").IsEnabled() ? "1" : "0"));
}

// A handler and a static object that tell of the process's exit.
void AwaitExit(const std::string&) {
  struct Farewell {
    ~Farewell() { Say("static object destroyed"); }
  };
  static const Farewell farewell;
  std::atexit([] { ShowNames("at exit"); });
}

// `rounds` requests over 64 places; each block is filled, and checked before it goes.
bool Work(Mgr& mgr, unsigned char mark, unsigned rounds) {
  std::array<std::pair<unsigned char*, unsigned>, 64> places{};
  bool kept = true;
  for (unsigned i = 0; i < rounds + places.size(); ++i) {
    auto& [data, size] = places[i % places.size()];
    if (data != nullptr) {
      kept = kept && std::count(data, data + size, mark) == std::ptrdiff_t(size) &&
             mgr.Contains(data) && mgr.Free(data);
      data = nullptr;
    }
    if (i >= rounds) continue;
    size = 1 + i * 7 % 60;
    data = static_cast<unsigned char*>(mgr.Alloc(size));
    std::memset(data, mark, size);
  }
  return kept;
}

void RunThreads(const std::string& rounds) {
  Mgr first("first");
  Mgr second("second");
  bool kept[2] = {};
  std::thread other([&] { kept[1] = Work(second, 0x55, Number(rounds)); });
  kept[0] = Work(first, 0xAA, Number(rounds));
  other.join();
  Say(kept[0] && kept[1] ? "nothing lost" : "lost");
}

const Verb verbs[] = {
    {"say", Say},
    {"settings", ShowSettings},
    {"lookups",
     [](const std::string&) {
       for (std::size_t i = 0; i < numLookups; ++i)
         Say(lookups[i]);
     }},
    {"bucket", [](const std::string& n) { ZOR_VOK_MEMPOOL_BUCKET_SIZE(Number(n)); }},
    {"align", [](const std::string& n) { ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(Number(n)); }},
    {"max", [](const std::string& n) { ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(Number(n)); }},
    {"min", [](const std::string& n) { ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(Number(n)); }},
    {"trace", [](const std::string& n) { ZOR_VOK_MEMPOOL_TRACE(n == "1"); }},
    {"pool", [](const std::string& name) { pools.push_back(new Mgr(name.c_str())); }},
    {"nameless", MakeNameless},
    {"drop", Drop},
    {"alloc", Alloc},
    {"free", Free},
    {"names", ShowNames},
    {"overfill", Overfill},
    {"report", [](const std::string&) { pools.back()->Dbg(); }},
    {"hex", [](const std::string&) { std::cout << std::hex << std::uppercase; }},
    {"global", [](const std::string&) { std::locale::global(GroupingLocale()); }},
    {"imbue", [](const std::string&) { std::cout.imbue(GroupingLocale()); }},
    {"await-exit", AwaitExit},
    // Ends that flush no stream: what isn't written by then is lost.
    {"cut", [](const std::string&) { std::_Exit(7); }},
    {"cut-exit", [](const std::string&) { std::atexit([] { std::_Exit(7); }); }},
    {"threads", RunThreads},
};

} // namespace

#ifdef __GLIBC__
// Stands in for the platform's function, to tell what is looked up and in which order.
char* secure_getenv(const char* key) noexcept {
  if (std::strncmp(key, "ZOR_", 4) == 0 && numLookups < std::size(lookups))
    lookups[numLookups++] = key;
  return std::getenv(key);
}
#endif

int main(int argc, char** argv) { return RunScript(verbs, argc, argv); }
