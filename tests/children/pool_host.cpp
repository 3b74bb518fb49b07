// A program that is not linked with the library: it loads and unloads it, or a client of it.
#include "Script.h"
#include "pool_client.h"

#include <cstdlib>
#include <string>
#include <vector>

#ifdef _WIN32
#include <windows.h>
#else
#include <dlfcn.h>
#endif
#ifdef __GLIBC__
#include <sys/auxv.h>
#endif

namespace {

#ifdef _WIN32
// What the platform has instead, under the names that the rest of this program uses.
constexpr int RTLD_NOW = 0;
constexpr int RTLD_NOLOAD = 1;
void* dlopen(const char* path, int mode) {
  return mode == RTLD_NOW ? LoadLibraryA(path) : GetModuleHandleA(path);
}
void* dlsym(void* library, const char* name) {
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(library), name));
}
void dlclose(void* library) { FreeLibrary(static_cast<HMODULE>(library)); }
std::string dlerror() { return "error " + std::to_string(GetLastError()); }
#endif

void* handle;
const PoolClient* client;
// Never destroyed, so that a leak checker finds in it what stands at the end.
auto& standing = *new std::vector<VOK::MemPool::Mgr*>;

void Opened(void* opened) {
  if (opened == nullptr) Say(dlerror());
  handle = opened;
  client = static_cast<const PoolClient*>(dlsym(handle, "poolClient"));
}

// Leaves nothing of what stood on the stack below the caller.
__attribute__((noinline)) void OverwriteStack() {
  volatile char bytes[1 << 16];
  for (volatile char& byte : bytes)
    byte = '#';
}

// The compiler takes dlopen for a function that never throws. Only a call that it can't see
// through leaves the caller a way to catch the refusal.
void Open(const std::string& path) {
  void* (*volatile const open)(const char*, int) = dlopen;
  const char* caught = nullptr;
  try {
    Opened(open(path.c_str(), RTLD_NOW));
  } catch (const char* text) {
    caught = text;
  }
  OverwriteStack();
  if (caught != nullptr) Say(caught);
}

void OpenDirectly(const std::string& path) {
  try {
    Opened(dlopen(path.c_str(), RTLD_NOW));
  } catch (const char* text) {
    Say(text);
  }
}

const Verb verbs[] = {
    {"open", Open},
    {"open-directly", OpenDirectly},
    {"close", [](const std::string&) { dlclose(handle); }},
    {"loaded",
     [](const std::string& path) {
       Say(dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD) != nullptr ? "loaded" : "not loaded");
     }},
#ifdef __GLIBC__
    {"raised", [](const std::string&) { Say(getauxval(AT_SECURE) != 0 ? "raised" : "plain"); }},
#endif
    {"grouping",
     [](const std::string&) {
       std::locale::global(GroupingLocale());
       std::cerr.imbue(GroupingLocale());
     }},
    {"make", [](const std::string&) { standing.push_back(client->make()); }},
    {"report", [](const std::string&) { client->report(standing.back()); }},
    {"stop", [](const std::string&) { client->stop(standing.back()); }},
    // Registered ahead of the library's own, a handler runs behind it.
    {"await-exit",
     [](const std::string&) {
       std::atexit([] {
         client->report(standing.back());
         client->destroy(standing.back());
         standing.pop_back();
       });
     }},
};

} // namespace

int main(int argc, char** argv) { return RunScript(verbs, argc, argv); }
