// word-index: on which lines of some texts does a word occur? The index maps each word to the list
// of its places. Nodes, words and places each have a named pool.
#include <CLI/CLI.hpp>
#include <MemPoolAllocator>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <forward_list>
#include <fstream>
#include <iostream>
#include <iterator>
#include <map>
#include <memory>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace {
using VOK::MemPool::Allocator;
using VOK::MemPool::Mgr;

struct Place {
  std::uint32_t file, line;
  bool operator==(const Place&) const = default;
};

// A string would store a short word in itself and not in its pool.
using Word = std::vector<char, Allocator<char>>;
using Places = std::forward_list<Place, Allocator<Place>>; // the one read last is first

struct ByText {
  using is_transparent = void;
  template <class A, class B>
  bool operator()(const A& a, const B& b) const {
    return std::string_view(a.data(), a.size()) < std::string_view(b.data(), b.size());
  }
};

class WordIndex {
public:
  using Tree = std::map<Word, Places, ByText, Allocator<std::pair<const Word, Places>>>;

  std::size_t numPlaces = 0;

  const Tree& Words() const { return *tree; }

  /// Adds a place of `word`; two occurrences on a line are one place.
  void Add(std::string_view word, const Place& place) {
    auto node = tree->find(word);
    if (node == tree->end())
      node = tree->try_emplace(Word(word.begin(), word.end(), words), postings).first;
    Places& places = node->second;
    if (!places.empty() && places.front() == place) return;
    places.push_front(place);
    ++numPlaces;
  }

  /// Erases the places in a file, and each word left without a place.
  void Drop(std::uint32_t file) {
    for (auto node = tree->begin(); node != tree->end();) {
      Places& places = node->second;
      numPlaces -= places.remove_if([&](const Place& place) { return place.file == file; });
      node = places.empty() ? tree->erase(node) : std::next(node);
    }
  }

  /// Frees everything: on the heap record by record, in pools at once. The map itself is in a pool,
  /// which frees it and all its elements without a destructor.
  void Clear() {
    if (nodes.IsEnabled()) static_cast<void>(tree.release());
    for (Mgr* const pool : {&nodes, &words, &postings})
      pool->Clear();
    tree = VOK::MemPool::MakeUnique<Tree>(nodes, nodes);
    numPlaces = 0;
  }

private:
  Mgr nodes{"nodes"}, words{"words"}, postings{"postings"};
  std::unique_ptr<Tree, VOK::MemPool::Deleter<Tree>> tree =
      VOK::MemPool::MakeUnique<Tree>(nodes, nodes);
};

struct Options {
  std::vector<std::string> files, queries;
  std::string drop;
  unsigned repeat = 1;
  bool heap = false, report = false, detailed = false;
};

/// The licence texts of the system, without the links, which point to other texts of the folder.
std::vector<std::string> Licences() {
  std::set<std::string> files;
  for (const auto& entry : std::filesystem::directory_iterator("/usr/share/common-licenses"))
    if (entry.is_regular_file() && !entry.is_symlink()) files.insert(entry.path().string());
  return {files.begin(), files.end()};
}

char Lower(char c) { return 'A' <= c && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

/// Adds the words of a file, its runs of ASCII letters in lower case, and returns its bytes.
std::uint64_t Read(const std::string& path, std::uint32_t file, WordIndex& index) {
  std::ifstream text(path, std::ios::binary);
  std::string line;
  std::string word;
  std::uint64_t bytes = 0;
  for (std::uint32_t number = 1; std::getline(text, line); ++number) {
    bytes += line.size() + (text.eof() ? 0 : 1);
    for (const char c : line + '\n') {
      const char letter = Lower(c);
      if ('a' <= letter && letter <= 'z')
        word += letter;
      else if (!word.empty())
        index.Add(std::exchange(word, ""), {file, number});
    }
  }
  if (!text.eof()) throw std::runtime_error("cannot read " + path);
  return bytes;
}

template <class Work>
void Timed(const char* step, Work work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  const std::chrono::duration<double> time = std::chrono::steady_clock::now() - start;
  std::cout << "seconds to " << step << ": " << std::to_string(time.count()) << '\n';
}

/// Prints how many places each word has, and the first three of them.
void Answer(const WordIndex& index, const std::vector<std::string>& words, const char* when,
            const std::vector<std::string>& names) {
  for (std::string word : words) {
    std::ranges::transform(word, word.begin(), Lower);
    std::ptrdiff_t number = 0;
    std::string first;
    if (const auto node = index.Words().find(word); node != index.Words().end()) {
      const Places& places = node->second;
      number = std::distance(places.begin(), places.end());
      for (auto place = std::next(places.begin(), std::max<std::ptrdiff_t>(number - 3, 0));
           place != places.end(); ++place)
        first.insert(0, ' ' + names[place->file] + ':' + std::to_string(place->line));
    }
    std::cout << word << when << ": " << number << " places" << first << '\n';
  }
}

/// Prints what a pool reports of a record, given nothing but its address.
void PrintRecord(const char* what, const char* pool, const void* record) {
  const Mgr& mgr = *VOK::MemPool::GetMgr(pool);
  std::cout << what << " in pool " << pool << ": GetSize " << mgr.GetSize(record) << ", Contains "
            << mgr.Contains(record) << '\n';
}

void Run(Options options) {
  if (options.files.empty()) options.files = Licences();
  std::vector<std::string> names; // one for each reading of a file
  for (unsigned n = 1; n <= options.repeat; ++n)
    for (const std::string& file : options.files)
      names.push_back(options.repeat == 1 ? file : file + '#' + std::to_string(n));
  const auto place = options.drop.empty() ? names.begin() : std::ranges::find(names, options.drop);
  if (place == names.end()) throw std::runtime_error("no file to drop: " + options.drop);
  const auto dropped = static_cast<std::uint32_t>(place - names.begin());
  VOK::MemPool::ZOR_VOK_MEMPOOL_OFF(options.heap); // applies to pools constructed from here on
  WordIndex index;
  std::uint64_t bytes = 0;
  Timed("build", [&] {
    for (std::uint32_t file = 0; file < names.size(); ++file)
      bytes += Read(options.files[file % options.files.size()], file, index);
  });
  std::cout << "pooling: " << (options.heap ? "off" : "on") << "\nfiles: " << names.size()
            << "\nbytes read: " << bytes << "\nwords: " << index.Words().size()
            << "\nplaces: " << index.numPlaces << '\n';
  Timed("query", [&] { Answer(index, options.queries, "", names); });
  Timed("drop", [&] { index.Drop(dropped); });
  std::cout << "words left: " << index.Words().size() << "\nplaces left: " << index.numPlaces
            << '\n';
  Answer(index, options.queries, " after drop", names);
  if (!index.Words().empty()) {
    // Of the adaptors' pointers here, the pool recognises only this one: an object aligned to more
    // than 4 may begin after the start of its record.
    const char* const text = index.Words().begin()->first.data();
    PrintRecord("a word", "words", text);
    PrintRecord("a word", "nodes", text);
  }
  if (options.report) VOK::MemPool::Dbg();
  if (options.detailed) VOK::MemPool::DbgDetailed();
  Timed("clear", [&] { index.Clear(); });
  std::ifstream status("/proc/self/status"); // where the system has it
  for (std::string key; status >> key;)
    if (key == "VmHWM:" && status >> key) std::cout << "peak resident set in KiB: " << key << '\n';
}

} // namespace

int main(int argc, char** argv) {
  Options options;
  CLI::App app("Indexes the words of texts, by default of the system's licence texts.");
  app.add_option("FILE", options.files, "a text to read");
  app.add_option("--query", options.queries, "a word to look up")->allow_extra_args(false);
  app.add_option("--drop", options.drop,
                 "the file whose places are dropped, by default the first one");
  app.add_option("--repeat", options.repeat, "how often to read")->check(CLI::Range(1, 9999));
  app.add_flag("--heap", options.heap, "run on the general heap");
  app.add_flag("--report", options.report, "print the pools' reports before they are cleared");
  app.add_flag("--detailed", options.detailed, "print the detailed reports");
  try {
    app.parse(argc, argv);
    Run(std::move(options));
    if (!std::cout.flush()) throw std::runtime_error("cannot write the answers");
  } catch (const CLI::Success& help) {
    return app.exit(help);
  } catch (const CLI::ParseError& error) {
    std::cerr << "word-index: " << error.what() << "\nusage: word-index [OPTION]... [FILE]...\n";
    return 2;
  } catch (const std::exception& error) {
    std::cerr << "word-index: " << error.what() << '\n';
    return 1;
  }
}
