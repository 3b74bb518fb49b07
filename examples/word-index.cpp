// word-index: on which lines of some texts does a word stand? The index is a tree of words, each
// with the list of its places. Nodes, words and postings lie in a named pool each. A pool aligns a
// record to 4 and no more, so they are made of 32-bit fields alone, links between them included.
#include "Link.h"

#include <CLI/CLI.hpp>
#include <MemPool>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <new>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace {
using VOK::MemPool::Mgr;

struct Posting {
  Link<Posting> next;
  std::uint32_t file, line;
};

struct Node {
  Link<char> text;
  std::uint32_t length;
  Link<Node> sides[2] = {};
  Link<Posting> first = {}, last = {}; // the word's places in the order of reading
  std::string_view Word() const { return {text, length}; }
};
static_assert(alignof(Posting) <= 4 && alignof(Node) <= 4, "a pool promises no more");

class WordIndex {
public:
  Link<Node> root; // like the counts, for others to read alone
  std::size_t numWords = 0, numPlaces = 0;

  ~WordIndex() { Clear(); }

  /// The link of the tree that leads to the word's node, or has to. At each step down the next bit
  /// of the word's hash picks the side, so that sorted words make a level tree too.
  Link<Node>& PlaceOf(std::string_view word) {
    std::size_t hash = std::hash<std::string_view>()(word);
    Link<Node>* place = &root;
    for (; *place && (*place)->Word() != word; hash >>= 1)
      place = &(*place)->sides[hash & 1];
    return *place;
  }

  /// Notes a place of `word`; twice on a line is one place. Files come in ascending order.
  void Add(std::string_view word, std::uint32_t file, std::uint32_t line) {
    Link<Node>& node = PlaceOf(word);
    if (!node) {
      const auto length = static_cast<std::uint32_t>(word.size());
      char* const text = static_cast<char*>(words.Alloc(length));
      word.copy(text, length);
      node = new (nodes.Alloc(sizeof(Node))) Node{text, length};
      ++numWords;
    }
    Link<Posting>& last = node->last;
    if (last && last->file == file && last->line == line) return;
    Posting* const posting = new (postings.Alloc(sizeof(Posting))) Posting{nullptr, file, line};
    (last ? last->next : node->first) = posting;
    last = posting;
    ++numPlaces;
  }

  /// Gives back the places in the files `from` to `to`, and each word left without a place. The
  /// words that stay make a new tree.
  void Drop(std::uint32_t from, std::uint32_t to) {
    std::vector<Node*> subtrees = {std::exchange(root, nullptr)};
    while (!subtrees.empty()) {
      Node* const node = subtrees.back();
      subtrees.pop_back();
      if (!node) continue;
      for (Link<Node>& side : node->sides)
        subtrees.push_back(std::exchange(side, nullptr));
      DropPlaces(*node, from, to);
      if (node->first) {
        PlaceOf(node->Word()) = node;
        continue;
      }
      words.Free(node->text);
      nodes.Free(node);
      --numWords;
    }
  }

  /// Gives back everything: pools at once, the heap record by record.
  void Clear() {
    if (!nodes.IsEnabled()) Drop(0, UINT32_MAX);
    for (Mgr* const pool : {&nodes, &words, &postings})
      pool->Clear();
    root = nullptr;
    numWords = numPlaces = 0;
  }

private:
  void DropPlaces(Node& node, std::uint32_t from, std::uint32_t to) {
    node.last = nullptr;
    for (Link<Posting>* place = &node.first; *place;) {
      Posting* const posting = *place;
      if (posting->file < from || posting->file > to) {
        node.last = posting;
        place = &posting->next;
        continue;
      }
      *place = posting->next;
      postings.Free(posting);
      --numPlaces;
    }
  }

  Mgr nodes{"nodes"}, words{"words"}, postings{"postings"};
};

struct Options {
  std::vector<std::string> files, queries;
  std::string drop;
  unsigned repeat = 1;
  bool heap = false, report = false, detailed = false;
};

/// The licence texts of the system, without the links, which lead to others of them.
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
  std::string line, word;
  std::uint64_t bytes = 0;
  for (std::uint32_t number = 1; std::getline(text, line); ++number) {
    bytes += line.size() + (text.eof() ? 0 : 1);
    for (const char c : line + '\n') {
      const char letter = Lower(c);
      if ('a' <= letter && letter <= 'z')
        word += letter;
      else if (!word.empty())
        index.Add(std::exchange(word, ""), file, number);
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

/// Prints for each word how many places it has, and the first three.
void Answer(WordIndex& index, const std::vector<std::string>& words, const char* when,
            const std::vector<std::string>& names) {
  for (std::string word : words) {
    std::ranges::transform(word, word.begin(), Lower);
    std::size_t number = 0;
    std::string first;
    const Node* const node = index.PlaceOf(word);
    for (const Posting* place = node ? node->first : nullptr; place; place = place->next)
      if (++number <= 3) first += ' ' + names[place->file] + ':' + std::to_string(place->line);
    std::cout << word << when << ": " << number << " places" << first << '\n';
  }
}

/// Prints what a pool knows of a record by nothing but its address.
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
  VOK::MemPool::ZOR_VOK_MEMPOOL_OFF(options.heap); // counts for the pools to come
  WordIndex index;
  std::uint64_t bytes = 0;
  Timed("build", [&] {
    for (std::uint32_t file = 0; file < names.size(); ++file)
      bytes += Read(options.files[file % options.files.size()], file, index);
  });
  std::cout << "pooling: " << (options.heap ? "off" : "on") << "\nfiles: " << names.size()
            << "\nbytes read: " << bytes << "\nwords: " << index.numWords
            << "\nplaces: " << index.numPlaces << '\n';
  Timed("query", [&] { Answer(index, options.queries, "", names); });
  Timed("drop", [&] { index.Drop(dropped, dropped); });
  std::cout << "words left: " << index.numWords << "\nplaces left: " << index.numPlaces << '\n';
  Answer(index, options.queries, " after drop", names);
  if (const Node* const node = index.root) {
    PrintRecord("a node", "nodes", node);
    PrintRecord("a word", "words", node->text);
    PrintRecord("a posting", "postings", node->first);
    PrintRecord("a word", "nodes", node->text);
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
  app.add_option("--drop", options.drop, "the file whose places go, by default the first one");
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
