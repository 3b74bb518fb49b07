#include "support/Reports.h"

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <regex>
#include <sstream>

using namespace VOK::MemPool;

namespace {

std::vector<std::string> LinesOf(const std::string& text) {
  std::istringstream in(text);
  std::vector<std::string> lines;
  for (std::string line; std::getline(in, line);)
    lines.push_back(line + "\n");
  return lines;
}

std::string WithoutCr(const std::string& text) {
  return std::regex_replace(text, std::regex("\r\n"), "\n");
}

} // namespace

void Reports::SetUp() { std::cout.copyfmt(std::ios(nullptr)); }

void Reports::TearDown() {
  for (const Mgr* pool : pools)
    delete pool;
  for (const std::string& fault : heap.Finish())
    ADD_FAILURE() << fault;
  std::cout.copyfmt(std::ios(nullptr));
}

Mgr& Reports::Make(const std::string& name, const std::string& set) {
  Set("bucket=4010 align=4 max=1000 min=8 keep=0 on=1 trace=0 " + set);
  pools.reserve(pools.size() + 1);
  const ArenaHeap::Use use;
  pools.push_back(new Mgr(name.c_str()));
  return *pools.back();
}

std::vector<void*> Reports::Alloc(Mgr& pool, unsigned number, unsigned size) {
  std::vector<void*> blocks(number);
  const ArenaHeap::Use use;
  for (void*& block : blocks)
    block = pool.Alloc(size);
  return blocks;
}

std::string Reports::Report(const std::function<void()>& report) {
  const auto before = Standing();
  const auto run = [&] {
    const ArenaHeap::Use use;
    report();
    return output.Take();
  };
  const std::string text = run();
  EXPECT_EQ(run(), text);
  EXPECT_TRUE(Standing() == before) << "the report changed its pool, or left something behind";
  static const std::regex place(":../s/MemPool:[ 0-9]{5}: ");
  return std::regex_replace(text, place, ":../s/MemPool:#####: ");
}

std::map<const void*, std::string> Reports::Standing() const {
  std::map<const void*, std::size_t> sizes;
  for (const ArenaHeap::Event& event : heap.events) {
    if (event.kind == '+') sizes[event.block] = event.size;
    if (event.kind == '-') sizes.erase(event.block);
  }
  std::map<const void*, std::string> blocks;
  for (const auto& [block, size] : sizes) {
    ArenaHeap::Open(block, size);
    blocks[block].assign(static_cast<const char*>(block), size);
  }
  return blocks;
}

std::string Changes(const std::string& before, const std::string& after) {
  std::map<std::string, int> spare;
  for (const std::string& line : LinesOf(before))
    ++spare[line];
  std::string gone;
  std::string added;
  for (const std::string& line : LinesOf(after))
    if (--spare[line] < 0) added += "+" + line;
  for (const std::string& line : LinesOf(before))
    if (--spare[line] >= 0) gone += "-" + line;
  return gone + added;
}

void ExpectGolden(const std::string& name, const std::string& text) {
  const std::string width = sizeof(void*) == 4 ? "-32.txt" : "-64.txt";
  const std::string path = VOK_MEMPOOL_GOLDEN "/report/" + name + width;
  if (std::getenv("VOK_MEMPOOL_APPROVE") != nullptr) {
    std::ofstream file(path, std::ios::binary);
    EXPECT_TRUE(file << WithoutCr(text) << std::flush) << path << " can't be written";
    return;
  }
  std::ostringstream golden;
  golden << std::ifstream(path, std::ios::binary).rdbuf();
  EXPECT_EQ(WithoutCr(text), WithoutCr(golden.str())) << "golden file: " << path;
}
