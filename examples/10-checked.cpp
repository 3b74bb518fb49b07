// A checked pool: it finds what goes wrong with its records and goes on. docs/checked.md shows what
// it finds; ZOR_VOK_MEMPOOL_CHECK=1 in the environment checks every pool that pools.
#include <MemPool>

#include <cstring>
#include <iostream>

using namespace VOK::MemPool;

int main() {
  unsigned numOverruns = 0;
  const auto count = [](Mgr&, const Finding& finding, void* number) {
    if (finding.kind == Finding::Kind::Overrun) ++*static_cast<unsigned*>(number);
  };
  {
    Mgr words("words", Options().On().Checked().AtFinding(count, &numOverruns));
    auto* const hello = static_cast<char*>(words.Alloc(5));
    auto* const world = static_cast<char*>(words.Alloc(6));
    words.Alloc(7);
    std::memcpy(world, "world", 6);
    std::memcpy(hello, world, 6); // one more than asked for
    words.Free(hello);
    words.Free(world);
    words.Free(world);
    words.Free(world + 1);
    world[0] = 'W';
    std::cout << words.GetNumFindings() << " findings so far\n";
  }
  std::cout << numOverruns << " of all was an overrun\n";
}
