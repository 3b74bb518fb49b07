// Clear at once: what belongs to one piece of work goes in one call, with no Free and no
// destructor.
#include <MemPoolAllocator>

#include <iostream>
#include <list>
#include <memory>
#include <sstream>
#include <string>

using namespace VOK::MemPool;

namespace {

using Text = std::basic_string<char, std::char_traits<char>, Allocator<char>>;
using Words = std::list<Text, Allocator<Text>>;

/// Lays the words of a message into the pool, the list itself too: nobody else owns any of it.
const Words& Parse(const char* message, Mgr& pool) {
  Words& words = *MakeUnique<Words>(pool, pool).release();
  std::istringstream text(message);
  for (std::string word; text >> word;)
    words.emplace_back(word.begin(), word.end(), pool);
  return words;
}

} // namespace

int main() {
  ZOR_VOK_MEMPOOL_ON(true); // with pooling off, Clear does nothing: the heap knows of no pool
  Mgr pool("message");
  for (const char* message : {"releases unconditionally", "all records, used or not", "at once"}) {
    const Words& words = Parse(message, pool);
    std::cout << words.size() << " words, the last is " << words.back() << '\n';
    pool.Clear(); // `words` is gone, and the pool serves on as a new one would
  }
}
