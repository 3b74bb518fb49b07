// The terminal as a page of lines, of which one is selected.
#ifndef VOK_MEMPOOL_TOOLS_INSPECT_SCREEN_H
#define VOK_MEMPOOL_TOOLS_INSPECT_SCREEN_H

#include <cstddef>
#include <string>
#include <vector>

namespace VOK::MemPool::Tools {

/// The terminal belongs to it while it lives.
class Screen {
public:
  enum class Key { None, Up, Down, Top, Bottom, Enter, Back, Quit, Other };

  /// Fails if standard output is no terminal.
  Screen();
  ~Screen();
  Screen(const Screen&) = delete;
  Screen& operator=(const Screen&) = delete;

  /// A title, the headings of a table and as many of its rows as fit, the selected one among them.
  void Draw(const std::string& title, const std::string& headings,
            const std::vector<std::string>& rows, std::size_t selected, const std::string& help);

  /// What is pressed within so many seconds; `letter` becomes the character of another key.
  Key Wait(double seconds, char& letter);

private:
  std::size_t first = 0; ///< row in sight
};

} // namespace VOK::MemPool::Tools

#endif
