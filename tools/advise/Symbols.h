// What the addresses of a recording mean: function, file and line, with what the compiler inlined.
// Test: tests/tools/record_test.py.
#ifndef VOK_MEMPOOL_TOOLS_ADVISE_SYMBOLS_H
#define VOK_MEMPOOL_TOOLS_ADVISE_SYMBOLS_H

#include "record/Reader.h"

#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

struct Dwfl;
struct Dwfl_Module;

namespace VOK::MemPool::Tools {

struct Location {
  std::string function; ///< demangled; without symbols, the module
  std::string file;     ///< empty without line tables
  int line = 0;
  std::uint64_t offset = 0; ///< in the function, where there is no line

  bool operator==(const Location&) const = default;
  /// The function without its result, parameters and template arguments.
  std::string GetName() const;

  /// "name (file:line)", the file without its folder, or "name+0xOFFSET".
  std::string GetText() const;
};

class Symbols {
public:
  explicit Symbols(const Recording& recording_) : recording(recording_) {}

  /// The functions that a stack's return addresses lie in, the innermost first; a frame counts
  /// several times if functions were inlined there.
  std::vector<Location> Resolve(const RecordedStack& stack);

private:
  struct Closer {
    void operator()(Dwfl* open) const;
  };

  void Open(std::size_t list);
  const std::vector<Location>& ResolveFrame(std::uint64_t address);
  void AddFunctions(Dwfl_Module* module, std::uint64_t address, Location& last,
                    std::vector<Location>& all) const;

  const Recording& recording;
  std::unique_ptr<Dwfl, Closer> dwfl;
  std::size_t openList = 0, openSize = 0; ///< the modules that are open
  std::unordered_map<std::uint64_t, std::vector<Location>> frames;
};

} // namespace VOK::MemPool::Tools

#endif
