// Which of two lists' items belong together: those of an earlier and of a later report.
// Test: tests/tools/picture_test.py.
#ifndef VOK_MEMPOOL_TOOLS_PICTURE_MATCH_H
#define VOK_MEMPOOL_TOOLS_PICTURE_MATCH_H

#include <cstddef>
#include <deque>
#include <map>
#include <set>
#include <vector>

namespace VOK::MemPool::Tools {

/// One item in two lists; it came or went where one of them lacks it.
template <class Item>
struct Pair {
  const Item* before = nullptr;
  const Item* now = nullptr;

  const Item& Get() const { return now != nullptr ? *now : *before; }
  const char* Change() const { return before == nullptr ? "came" : now == nullptr ? "went" : ""; }
};

/// The items of `now` in their order, each with the one of `before` that has the same key, and then
/// what is left of `before`. Of equal keys the first belongs to the first.
template <class Item, class KeyOf>
std::vector<Pair<Item>> Match(const std::vector<Item>& before, const std::vector<Item>& now,
                              KeyOf keyOf) {
  std::map<decltype(keyOf(now.front())), std::deque<const Item*>> byKey;
  for (const Item& item : before)
    byKey[keyOf(item)].push_back(&item);
  std::set<const Item*> taken;
  std::vector<Pair<Item>> pairs;
  for (const Item& item : now) {
    pairs.push_back({nullptr, &item});
    const auto found = byKey.find(keyOf(item));
    if (found == byKey.end() || found->second.empty()) continue;
    pairs.back().before = found->second.front();
    taken.insert(found->second.front());
    found->second.pop_front();
  }
  for (const Item& item : before)
    if (!taken.contains(&item)) pairs.push_back({&item, nullptr});
  return pairs;
}

} // namespace VOK::MemPool::Tools

#endif
