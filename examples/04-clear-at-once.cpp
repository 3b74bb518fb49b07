// Clear at once: one call frees all memory of one piece of work, with no Free and no destructor.
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

/// Allocates the words of a message in the pool, and the list itself too: the pool owns all of it.
const Words& Parse(const char* message, Mgr& pool) {
  Words& words = *MakeUnique<Words>(pool, pool).release();
  std::istringstream text(message);
  for (std::string word; text >> word;)
    words.emplace_back(word.begin(), word.end(), pool);
  return words;
}

} // namespace

int main() {
  ZOR_VOK_MEMPOOL_ON(true); // with pooling off, Clear does nothing: the blocks are the heap's
  Mgr pool("message");
  for (const char* message : {"releases unconditionally", "all records, used or not", "at once"}) {
    const Words& words = Parse(message, pool);
    std::cout << words.size() << " words, the last is " << words.back() << '\n';
    pool.Clear(); // `words` is freed, and the pool continues as a new one would
  }
}
