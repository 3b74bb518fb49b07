// Scripts of operations on pools. A line holds commands, separated by "; ". Its transcript adds to
// each " -> " and the result, and below, behind two blanks, what the library wrote ("  |" and the
// line). Run drops all that from its input, so a case is one text that must be its own transcript.
// In it, <A|B> stands for A at 4-byte and for B at 8-byte pointers.
//
//   set K=N ...        settings: bucket, align, max, min, keep, on, trace
//   pool P [NAME]      makes a pool named P, or NAME; - asks for an automatic name, "" is empty
//   alloc P X N        a block, filled by the script; told by its place: "#2+18" is the second
//                      bucket that was seen and the record's offset, "ext", "heap"
//   free|size|has P X  X is null, other (a place of no pool) or a name, maybe with +N bytes
//   clear|gc|name|enabled|drop P
//   show P             its Groups: index, data bytes, the list of all buckets with their free
//                      chains, the list of those with a free record, the tail; then its ExtRecs
//   get NAME, mgrs     the registry, and the NAME - is null; end is that of the registry
//   fail K [on]        the K-th allocation from now on fails (on: and all later ones)
//   heap               tells heap events, or no longer: + allocated, - released, ! failed, each
//   with
//                      a class of the engine, the bytes of an array, or std; | is a written line
//   raw, hex           shows addresses as they are, sets std::cout to hex
#ifndef VOK_MEMPOOL_TESTS_SCRIPT_H
#define VOK_MEMPOOL_TESTS_SCRIPT_H

#include "support/ArenaHeap.h"

#include "MemPool"

#include <cstdint>
#include <functional>
#include <ios>
#include <locale>
#include <map>
#include <sstream>
#include <streambuf>
#include <string>

namespace VOK::MemPool {
struct Bucket;
}

/// The settings as they were, put back at the end.
class KeepSettings {
public:
  KeepSettings();
  ~KeepSettings();
  KeepSettings(const KeepSettings&) = delete;
  KeepSettings& operator=(const KeepSettings&) = delete;

private:
  const unsigned bucketSize, dataAlignment, maxRecordSize, minRecordSize;
  const bool keepEmptyBuckets, trace, on;
};

/// Sets what the text names, as the command set.
void Set(std::istream& words);
void Set(const std::string& words);

/// Catches std::cout and keeps its text off the arena; puts back buffer and flags.
class CaughtOutput : std::streambuf {
public:
  explicit CaughtOutput(std::function<void()> atLine);
  ~CaughtOutput() override;

  /// What came since the last call.
  std::string Take();

private:
  int_type overflow(int_type c) override;

  const std::function<void()> atLine;
  std::streambuf* const buffer;
  const std::ios_base::fmtflags flags;
  std::string text;
};

/// While it lives, the global locale groups digits.
class GroupingLocale {
public:
  GroupingLocale();
  ~GroupingLocale();
  GroupingLocale(const GroupingLocale&) = delete;
  GroupingLocale& operator=(const GroupingLocale&) = delete;

private:
  const std::locale before;
};

class Script {
public:
  ArenaHeap heap;
  bool retries =
      false; ///< a command that met bad_alloc is run once more, and told of as if it had not failed

  Script();
  ~Script();
  Script(const Script&) = delete;
  Script& operator=(const Script&) = delete;

  /// The transcript of `text`. Behind each command all pools are walked, and a command that mayn't
  /// allocate is held to it.
  std::string Run(const std::string& text);

  /// Drops what pools are left; then what the arena has to tell against it.
  std::string Finish();

  VOK::MemPool::Mgr& Pool(const std::string& name) { return *pools.at(name); }
  std::uint8_t* Pointer(const std::string& name) const;

private:
  std::string Step(const std::string& command, std::string& below);
  std::string Command(std::istream& words);
  void Make(const std::string& name, const std::string& given);
  std::string Alloc(VOK::MemPool::Mgr& pool, const std::string& name, const std::string& number);
  std::string Found(const VOK::MemPool::Mgr* found) const;
  std::string Show(VOK::MemPool::Mgr& pool);
  std::string Chain(VOK::MemPool::Bucket& bucket);
  std::string Name(const VOK::MemPool::Bucket* bucket);
  std::string WithNames(const std::string& text) const;
  std::string HeapEvents() const;

  KeepSettings settings;
  CaughtOutput output;
  std::map<std::string, VOK::MemPool::Mgr*> pools;
  std::map<std::string, std::uint8_t*> pointers;
  std::map<std::uintptr_t, std::string> names; // of pools and pointers, by their address
  std::map<const void*, int> buckets;          // that stand, numbered by first sight
  int numBuckets = 0;
  bool tellsHeap = false;
  bool isRaw = false;
};

/// Runs `text` and expects that it is its own transcript, and that nothing is left on the heap.
void Expect(const std::string& text, const char* file = __builtin_FILE(),
            int line = __builtin_LINE());

#endif
