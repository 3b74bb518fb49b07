// The library's start and end: all its load-time objects, in their order, in the one unit that has
// an initialiser. A client runs after them, since a library is initialised before its users;
// nothing else ensures that the registry and the settings exist before the first Mgr.
// Test: tests/process_test.py, scripts/checks/library.
#include "services/MgrRegistry.h"
#include "services/Observers.h"
#include "services/Output.h"
#include "services/Settings.h"

#include <iostream>

namespace VOK::MemPool {

namespace {

struct RegistryLife {
  RegistryLife() { MgrRegistry::Begin(); }
  ~RegistryLife() { MgrRegistry::End(); }
};

// A stream stores its fill character when it is first asked for it. Asked here, later lines of two
// threads only read it.
struct OutputLife {
  OutputLife() { std::cout.fill(); }
};

struct ObserversLife {
  ObserversLife() { Observers::Begin(); }
};

struct SettingsLife {
  SettingsLife() { Settings::Load(); }
};

// The settings come last, since they may refuse the load with an exception. The library stays
// mapped then, and a program that loads it again gets it as it is: whole.
const RegistryLife registryLife;
const OutputLife outputLife;
const ObserversLife observersLife;
const SettingsLife settingsLife;

} // namespace

std::ostream& StandardOutput() { return std::cout; }
std::ostream& StandardError() { return std::cerr; }

} // namespace VOK::MemPool
