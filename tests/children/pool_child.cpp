// What process_test starts: a program that does what its argument says, operations with ";" between
// them and, after a "|", those at its exit. It is built three times: with the library, as a client
// library, and as a host, which is linked with neither and loads them.
#include "support/Process.h"

#include <cstdio>
#include <cstdlib>

#ifdef _WIN32
#include <windows.h>

// What the platform has instead, under the names that the rest of this program uses.
constexpr int RTLD_NOW = 0;
static void* dlopen(const char* path, int) { return LoadLibraryA(path); }
static void* dlsym(void* library, const char* name) {
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(library), name));
}
static void dlclose(void* library) { FreeLibrary(static_cast<HMODULE>(library)); }
#else
#include <csignal>
#include <dlfcn.h>
#include <sys/wait.h>
#include <unistd.h>
#endif

using namespace VOK::MemPool;

struct State {
  Mgr& Pool() { return *pools.back(); }
  unsigned Number() const { return static_cast<unsigned>(std::stoul(operand)); }
  void*& Block() { return blocks[Number()]; }

  std::vector<Mgr*> pools;
  std::vector<void*> blocks; // by their numbers in the order of requests
  std::string operand;
};

/// Runs the operation; false if there is none of that name.
extern "C" bool Act(const std::string& name, State& state);

namespace {

// Never destroyed, so that a leak check finds in it what exists at the end.
auto& ownState = *new State;
void* handle;
decltype(&Act) actOfClient;

// The compiler takes dlopen for a function that never throws. Only a call that it can't see
// through leaves the caller a way to catch what a load throws.
void Open(State& s) {
  void* (*volatile const open)(const char*, int) = dlopen;
  handle = open(s.operand == "client" ? VOK_MEMPOOL_CLIENT : VOK_MEMPOOL_LIBRARY, RTLD_NOW);
  if (handle == nullptr) std::abort();
  actOfClient = reinterpret_cast<decltype(actOfClient)>(dlsym(handle, "Act"));
}

#ifndef VOK_MEMPOOL_HOST
const bool wanted = std::getenv("ZOR_STATIC_POOLS") != nullptr;
const std::unique_ptr<Mgr> named(wanted ? new Mgr("client") : nullptr);
const std::unique_ptr<Mgr> nameless(wanted ? new Mgr : nullptr);

void Alloc(State& s) {
  s.blocks.push_back(s.Pool().Alloc(std::stoull(s.operand)));
  std::memset(s.blocks.back(), 1, std::min(s.Number(), 1U << 16));
}

// So many buckets, of four records each.
void Build(State& s) {
  for (unsigned i = 4 * s.Number(); i > 0; --i)
    s.Pool().Alloc(992);
}

// The compiler must not drop a write that nothing reads.
void Write(State& s) { static_cast<volatile char*>(s.blocks.back())[std::stol(s.operand)] = 2; }

// Which request had the last block's address first.
void Where(State& s) {
  std::cout << std::ranges::find(s.blocks, s.blocks.back()) - s.blocks.begin() << '\n';
}

// Where the pool of that name is in the list of this program; null is a name, too.
void Find(State& s) {
  const char* const name = s.operand.empty() ? nullptr : s.operand.c_str();
  std::cout << std::ranges::find(s.pools, GetMgr(name)) - s.pools.begin() << '\n';
}

// By both lists, which append to what is in them.
void ShowNames(State&) {
  std::vector<Mgr*> mgrs(1);
  GetMgrs(mgrs);
  VOK::vector<Mgr*> own;
  own.Append(nullptr);
  GetMgrs(own);
  std::cout << GetNumMgrs() << " of " << own.capacity
            << (std::ranges::equal(own, mgrs) ? ":" : "?");
  for (std::size_t i = 1; i < mgrs.size(); ++i)
    std::cout << ' ' << mgrs[i]->GetName();
  std::cout << std::endl;
}
#endif

constexpr struct {
  const char* name;
  void (*act)(State& s);
} operations[] = {
    {"say", [](State& s) { std::cout << s.operand << std::endl; }},
    {"grouping", [](State&) { std::locale::global(Grouping()), std::cerr.imbue(std::locale()); }},
    {"cut", [](State&) { std::_Exit(7); }}, // flushes no stream
    {"open", Open},
    {"close", [](State&) { dlclose(handle), actOfClient = nullptr; }},
#ifndef _WIN32
    {"core", [](State&) { fork() == 0 ? std::abort() : static_cast<void>(wait(nullptr)); }},
    {"stop", [](State&) { std::raise(SIGSTOP); }},
#endif
#ifndef VOK_MEMPOOL_HOST
    {"set", [](State& s) { Set(s.operand); }},
    {"pool", [](State& s) { s.pools.push_back(new Mgr(s.operand.c_str())); }},
    {"nameless", [](State& s) { s.pools.push_back(new Mgr); }},
    {"find", Find},
    {"turn", [](State& s) { std::reverse(s.pools.begin(), s.pools.end()); }},
    {"drop", [](State& s) { delete &s.Pool(), s.pools.pop_back(); }},
    {"build", Build},
    {"clear", [](State& s) { s.Pool().Clear(); }},
    {"reset", [](State& s) { std::cout << s.Pool().Reset() << '\n'; }},
    {"report", [](State&) { DbgDetailed(); }},
    {"alloc", Alloc},
    {"free", [](State& s) { std::cout << (s.Pool().Free(s.Block()) ? "freed\n" : "refused\n"); }},
    {"size", [](State& s) { std::cout << s.Pool().GetSize(s.Block()) << '\n'; }},
    {"contains", [](State& s) { std::cout << s.Pool().Contains(s.Block()) << '\n'; }},
    {"where", Where},
    {"write", Write},
    {"forget", [](State& s) { s.blocks.back() = nullptr; }},
    {"names", ShowNames},
#endif
};

// Leaves nothing of what lay on the stack below the caller.
__attribute__((noinline)) void OverwriteStack() {
  volatile char bytes[1 << 16];
  for (volatile char& byte : bytes)
    byte = '#';
}

void Run(const std::string& script) {
  std::istringstream parts(script);
  for (std::string part; std::getline(parts, part, ';');) {
    std::istringstream words(part);
    std::string name;
    ownState.operand.clear();
    std::getline(words >> name >> std::ws, ownState.operand, '\0');
    ownState.operand.erase(ownState.operand.find_last_not_of(' ') + 1);
    try {
      if (!Act(name, ownState) && actOfClient != nullptr) actOfClient(name, ownState);
    } catch (const char* text) {
      OverwriteStack();
      std::cout << text << std::endl;
    } catch (const std::bad_alloc&) { // of a request that no test relies on
    }
  }
}

} // namespace

bool Act(const std::string& name, State& state) {
  for (const auto& operation : operations)
    if (operation.name == name) return operation.act(state), true;
  return false;
}

#if defined(__GLIBC__) && !defined(VOK_MEMPOOL_HOST)
// Replaces the platform's function, to show what is looked up and in which order.
// NOLINTNEXTLINE(readability-inconsistent-declaration-parameter-name): the platform's is reserved
char* secure_getenv(const char* key) noexcept {
  if (std::getenv("ZOR_SHOW_KEYS") != nullptr) std::printf("%s\n", key);
  return std::getenv(key);
}
#endif

int main(int, char** argv) {
  std::istringstream scripts(argv[1]);
  std::string script;
  static std::string lastScript;
  std::getline(std::getline(scripts, script, '|'), lastScript);
  std::atexit([] { Run(lastScript); });
  Run(script);
}
