// The library's start and end: all its load-time objects, in their order, in the one unit that has
// an initialiser. A client runs after them, since a shared library is initialised before its users;
// nothing else ensures that the registry and the settings exist before the first Mgr. Of the static
// library a linker takes this unit along with any other, since all lines need its streams.
// Test: tests/process_test.py, scripts/checks/library, scripts/checks/install.
#include "base/KeepStores.h"
#include "services/MgrRegistry.h"
#include "services/Observers.h"
#include "services/Output.h"
#include "services/Settings.h"

#include <iostream>

// In a program the linker decides the order of static objects. 101 is the first priority that isn't
// the compiler's own, so that these precede the program's objects with a priority, too.
#ifdef VOK_MEMPOOL_STATIC
#define VOK_FIRST __attribute__((init_priority(101)))
#else
#define VOK_FIRST
#endif

namespace VOK::MemPool {

struct Layout;
extern const Layout layout; // defined by the diagnostics, which know all that it describes

namespace {

// The registry takes along what describes it, in a program that the static library is linked with.
struct RegistryLife {
  RegistryLife() {
    MgrRegistry::Begin();
    KeepStores(&layout);
  }
  ~RegistryLife() { MgrRegistry::End(); }
};

// A stream stores its fill character when it is first asked for it. Asked here, later lines of two
// threads only read it. The streams begin here where the header's own object comes later.
struct OutputLife {
  OutputLife() { std::cout.fill(); }
  std::ios_base::Init streams;
};

struct ObserversLife {
  ObserversLife() { Observers::Begin(); }
};

struct SettingsLife {
  SettingsLife() { Settings::Load(); }
};

// The settings come last, since they may refuse the load with an exception. The library stays
// mapped then, and a program that loads it again gets it as it is: whole. One object for all
// of this, whose constructor throws, hangs the process under wine.
VOK_FIRST const RegistryLife registryLife;
VOK_FIRST const OutputLife outputLife;
VOK_FIRST const ObserversLife observersLife;
VOK_FIRST const SettingsLife settingsLife;

} // namespace

std::ostream& StandardOutput() { return std::cout; }
std::ostream& StandardError() { return std::cerr; }

} // namespace VOK::MemPool
