// The library's start and end, in their order, in the one unit that has an initialiser. A client
// runs after it, since a shared library is initialised before its users; nothing else ensures that
// the registry and the settings exist before the first Mgr. Of the static library a linker takes
// this unit along with any other, since all lines need its streams. Test: tests/process_test.py,
// scripts/checks/library, scripts/checks/install.
#include "services/MgrRegistry.h"
#include "services/Observers.h"
#include "services/Output.h"
#include "services/Settings.h"

#include <cstdlib>
#include <iostream>

// In a program the linker decides the order of static objects. 101 is the first priority that isn't
// the compiler's own, so that this one precedes the program's objects with a priority, too.
#ifdef VOK_MEMPOOL_STATIC
#define VOK_FIRST __attribute__((init_priority(101)))
#else
#define VOK_FIRST
#endif

namespace VOK::MemPool {

namespace {

struct Library {
  std::ios_base::Init streams; // where the header's own object comes later

  // A stream stores its fill character when it is first asked for it. Asked here, later lines of
  // two threads only read it. The settings come last, since they may refuse the load with an
  // exception. The library stays mapped then, and a program that loads it again gets it as it is:
  // whole, its end included.
  Library() {
    MgrRegistry::Begin();
    std::atexit(MgrRegistry::End);
    std::cout.fill();
    Observers::Begin();
    Settings::Load();
  }
};

VOK_FIRST const Library library;

} // namespace

std::ostream& StandardOutput() { return std::cout; }
std::ostream& StandardError() { return std::cerr; }

} // namespace VOK::MemPool
