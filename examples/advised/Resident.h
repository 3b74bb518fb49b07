// What a program's heap takes: bytes of memory that belong to no file.
#ifndef VOK_MEMPOOL_EXAMPLES_ADVISED_RESIDENT_H
#define VOK_MEMPOOL_EXAMPLES_ADVISED_RESIDENT_H

#include <fstream>
#include <string>

inline long ResidentKiB() {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;)
    if (word == "RssAnon:") {
      long kibibytes = 0;
      status >> kibibytes;
      return kibibytes;
    }
  return 0;
}

#endif
