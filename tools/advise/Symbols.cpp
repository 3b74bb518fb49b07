#include "advise/Symbols.h"

#include <algorithm>
#include <cstdlib>
#include <cxxabi.h>
#include <dwarf.h>
#include <elfutils/libdw.h>
#include <elfutils/libdwfl.h>
#include <filesystem>
#include <fmt/format.h>
#include <string_view>

namespace VOK::MemPool::Tools {

namespace {

template <class Type>
using Owned = std::unique_ptr<Type, decltype(&std::free)>;

std::string Demangled(const char* name) {
  int status = 0;
  const Owned<char> text(abi::__cxa_demangle(name, nullptr, nullptr, &status), &std::free);
  return text != nullptr ? text.get() : name;
}

std::string ShortName(const std::string& path) {
  return std::filesystem::path(path).filename().string();
}

std::string NameOf(Dwarf_Die* function) {
  Dwarf_Attribute attribute;
  const char* name =
      dwarf_formstring(dwarf_attr_integrate(function, DW_AT_linkage_name, &attribute));
  if (name == nullptr)
    name = dwarf_formstring(dwarf_attr_integrate(function, DW_AT_name, &attribute));
  return name != nullptr ? Demangled(name) : "a function without a name";
}

Dwarf_Word NumberOf(Dwarf_Die* die, unsigned name) {
  Dwarf_Attribute attribute;
  Dwarf_Word number = 0;
  dwarf_formudata(dwarf_attr(die, name, &attribute), &number);
  return number;
}

/// The file of a call that was inlined.
std::string CallFileOf(Dwarf_Die* unit, Dwarf_Die* call) {
  Dwarf_Files* files = nullptr;
  std::size_t count = 0;
  const Dwarf_Word index = NumberOf(call, DW_AT_call_file);
  if (dwarf_getsrcfiles(unit, &files, &count) != 0 || index >= count) return {};
  const char* const file = dwarf_filesrc(files, index, nullptr, nullptr);
  return file != nullptr ? file : "";
}

/// The compilation unit of an address, null without debug information. clang writes no table of the
/// addresses of its units, so each is asked then.
Dwarf_Die* UnitAt(Dwfl_Module* module, std::uint64_t address, Dwarf_Addr& bias) {
  Dwarf_Die* unit = dwfl_module_addrdie(module, address, &bias);
  if (unit != nullptr) return unit;
  while ((unit = dwfl_module_nextcu(module, unit, &bias)) != nullptr)
    if (dwarf_haspc(unit, address - bias) > 0) return unit;
  return nullptr;
}

} // namespace

std::string Location::GetName() const {
  constexpr std::string_view unnamed = "(anonymous namespace)::";
  std::string text = function;
  for (std::size_t at = 0; (at = text.find(unnamed)) != std::string::npos;)
    text.erase(at, unnamed.size());
  if (text.starts_with("operator")) return text;
  text.erase(std::min(text.find_first_of("<(["), text.size()));
  return text.substr(text.rfind(' ') + 1);
}

std::string Location::GetText() const {
  return file.empty() ? fmt::format("{}+0x{:x}", GetName(), offset)
                      : fmt::format("{} ({}:{})", GetName(), ShortName(file), line);
}

void Symbols::Closer::operator()(Dwfl* open) const { dwfl_end(open); }

std::vector<Location> Symbols::Resolve(const RecordedStack& stack) {
  Open(stack.modules);
  std::vector<Location> all;
  for (const std::uint64_t address : stack.frames) {
    const std::vector<Location>& more = ResolveFrame(address);
    all.insert(all.end(), more.begin(), more.end());
  }
  return all;
}

void Symbols::Open(std::size_t list) {
  static const Dwfl_Callbacks callbacks{.find_elf = dwfl_build_id_find_elf,
                                        .find_debuginfo = dwfl_standard_find_debuginfo,
                                        .section_address = dwfl_offline_section_address,
                                        .debuginfo_path = nullptr};
  const std::vector<RecordedModule>& modules = recording.modules[list];
  if (dwfl && openList == list && openSize == modules.size()) return;
  frames.clear();
  openList = list;
  openSize = modules.size();
  dwfl.reset(dwfl_begin(&callbacks));
  dwfl_report_begin(dwfl.get());
  for (const RecordedModule& module : modules) {
    const std::string& path = module.path.empty() ? recording.executable : module.path;
    dwfl_report_elf(dwfl.get(), ShortName(path).c_str(), path.c_str(), -1, module.address, true);
  }
  dwfl_report_end(dwfl.get(), nullptr, nullptr);
}

const std::vector<Location>& Symbols::ResolveFrame(std::uint64_t returnAddress) {
  const auto [entry, isNew] = frames.try_emplace(returnAddress);
  std::vector<Location>& all = entry->second;
  if (!isNew) return all;
  const std::uint64_t address = returnAddress - 1; // in the call
  Dwfl_Module* const module = dwfl_addrmodule(dwfl.get(), address);
  Location last;
  if (module == nullptr) {
    last = {.function = "unknown", .file = {}, .offset = returnAddress};
    return all.push_back(last), all;
  }
  AddFunctions(module, address, last, all);
  if (last.function.empty()) {
    GElf_Off offset = 0;
    GElf_Sym symbol;
    const char* const name =
        dwfl_module_addrinfo(module, address, &offset, &symbol, nullptr, nullptr, nullptr);
    Dwarf_Addr start = 0;
    const char* const file =
        dwfl_module_info(module, nullptr, &start, nullptr, nullptr, nullptr, nullptr, nullptr);
    last.function = name != nullptr ? Demangled(name) : file;
    last.offset = name != nullptr ? offset + 1 : returnAddress - start;
    all.push_back(last);
  }
  return all;
}

/// Adds the functions that were inlined at an address, and the one that they lie in, with their
/// lines. `last` ends as the outermost of them, without a function if that isn't known.
void Symbols::AddFunctions(Dwfl_Module* module, std::uint64_t address, Location& last,
                           std::vector<Location>& all) const {
  Dwarf_Addr bias = 0;
  Dwarf_Die* const unit = UnitAt(module, address, bias);
  if (unit == nullptr) return;
  Dwarf_Line* const line = dwarf_getsrc_die(unit, address - bias);
  const char* const file = dwarf_linesrc(line, nullptr, nullptr);
  if (file != nullptr && dwarf_lineno(line, &last.line) == 0) last.file = file;
  Dwarf_Die* scopes = nullptr;
  const int count = dwarf_getscopes(unit, address - bias, &scopes);
  const Owned<Dwarf_Die> owner(scopes, &std::free);
  for (int i = 0; i < count; ++i) {
    const int tag = dwarf_tag(&scopes[i]);
    if (tag != DW_TAG_inlined_subroutine && tag != DW_TAG_subprogram) continue;
    last.function = NameOf(&scopes[i]);
    all.push_back(last);
    if (tag == DW_TAG_subprogram) return;
    last = {.function = {},
            .file = CallFileOf(unit, &scopes[i]),
            .line = static_cast<int>(NumberOf(&scopes[i], DW_AT_call_line)),
            .offset = 0};
  }
}

} // namespace VOK::MemPool::Tools
