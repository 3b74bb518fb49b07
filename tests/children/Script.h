// What the programs that process_test starts have in common: they do what their arguments tell, one
// operation each, a verb and behind a blank its operand.
#ifndef VOK_MEMPOOL_SCRIPT_H
#define VOK_MEMPOOL_SCRIPT_H

#include <algorithm>
#include <cstddef>
#include <iostream>
#include <locale>
#include <string>

struct Verb {
  const char* name;
  void (*act)(const std::string& operand);
};

template <std::size_t N>
int RunScript(const Verb (&verbs)[N], int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    const std::string operation = argv[i];
    const std::string verb = operation.substr(0, operation.find(' '));
    const std::string operand = operation.substr(std::min(verb.size() + 1, operation.size()));
    bool known = false;
    for (const Verb& candidate : verbs) {
      if (candidate.name != verb) continue;
      candidate.act(operand);
      known = true;
    }
    if (known) continue;
    std::cerr << "usage: VERB[ OPERAND]..., and there is no verb " << verb << std::endl;
    return 2;
  }
  return 0;
}

inline void Say(const std::string& text) { std::cout << text << std::endl; }

/// A locale that groups the digits of every number by one.
inline std::locale GroupingLocale() {
  struct Grouping : std::numpunct<char> {
    char do_thousands_sep() const override { return '_'; }
    std::string do_grouping() const override { return "\1"; }
  };
  return std::locale(std::locale::classic(), new Grouping);
}

#endif
