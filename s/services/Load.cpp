// The library's start and end: all its load-time objects, in their order, in the one unit that has
// an initialiser. A client runs behind them, since a library is initialised before its users;
// nothing else secures that the registry and the settings stand before the first Mgr.
// Test: tests/process_test.py, scripts/check-library.
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

struct SettingsLife {
  SettingsLife() { Settings::Load(); }
};

struct ObserversLife {
  ObserversLife() { Observers::Begin(); }
};

const RegistryLife registryLife;
const SettingsLife settingsLife;
const ObserversLife observersLife;

} // namespace

std::ostream& StandardOutput() { return std::cout; }
std::ostream& StandardError() { return std::cerr; }

OutputLine::OutputLine() : os(std::cout.rdbuf()) {
  os.setstate(std::cout.rdstate());
  os.imbue(std::cout.getloc());
  os.flags(std::cout.flags());
  os.fill(std::cout.fill());
  os.width(std::cout.width(0)); // the next insertion uses it up
}

} // namespace VOK::MemPool
