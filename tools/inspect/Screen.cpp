#include "inspect/Screen.h"

#include "common/Tool.h"

#include <algorithm>
#include <cstdio>
#include <curses.h>
#include <unistd.h>

namespace VOK::MemPool::Tools {

namespace {

void PutLine(int line, const std::string& text, attr_t look = A_NORMAL) {
  attrset(static_cast<int>(look));
  mvaddnstr(line, 0, text.c_str(), COLS);
  if (look == A_REVERSE) mvchgat(line, 0, -1, look, 0, nullptr);
  attrset(A_NORMAL);
}

} // namespace

Screen::Screen() {
  if (isatty(STDOUT_FILENO) == 0 || newterm(nullptr, stdout, stdin) == nullptr)
    throw Failure("standard output is no terminal; --batch N prints rounds");
  cbreak();
  noecho();
  keypad(stdscr, TRUE);
  set_escdelay(25);
  curs_set(0);
}

Screen::~Screen() { endwin(); }

void Screen::Draw(const std::string& title, const std::string& headings,
                  const std::vector<std::string>& rows, std::size_t selected,
                  const std::string& help) {
  constexpr int head = 3; // lines above the rows
  const auto room = static_cast<std::size_t>(std::max(LINES - head - 1, 1));
  first = std::clamp(first, selected < room ? 0 : selected - room + 1, selected);
  erase();
  PutLine(0, title, A_BOLD);
  PutLine(head - 1, headings, A_UNDERLINE);
  for (std::size_t i = first; i < std::min(rows.size(), first + room); ++i)
    PutLine(head + static_cast<int>(i - first), rows[i], i == selected ? A_REVERSE : A_NORMAL);
  PutLine(LINES - 1, help, A_DIM);
  refresh();
}

Screen::Key Screen::Wait(double seconds, char& letter) {
  timeout(static_cast<int>(seconds * 1000));
  const int key = getch();
  switch (key) {
  case ERR:
  case KEY_RESIZE:
    return Key::None;
  case KEY_UP:
    return Key::Up;
  case KEY_DOWN:
    return Key::Down;
  case KEY_HOME:
    return Key::Top;
  case KEY_END:
    return Key::Bottom;
  case '\n':
  case KEY_ENTER:
    return Key::Enter;
  case 27: // escape
  case KEY_BACKSPACE:
    return Key::Back;
  case 'q':
    return Key::Quit;
  default:
    letter = key < 128 ? static_cast<char>(key) : ' ';
    return Key::Other;
  }
}

} // namespace VOK::MemPool::Tools
