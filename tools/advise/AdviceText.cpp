// The advice as text, and as the JSON from which the page is drawn.
#include "advise/Advice.h"

#include <algorithm>
#include <fmt/format.h>
#include <numeric>
#include <span>
#include <string_view>

namespace VOK::MemPool::Tools {

namespace {

using Json = nlohmann::ordered_json;

constexpr double leastShare = 1;         // percent of what has a line of its own
constexpr std::ptrdiff_t leastShown = 3; // call sites, even with fewer requests

std::string Count(std::uint64_t number) {
  const std::string digits = std::to_string(number);
  std::string text;
  for (std::size_t i = 0; i < digits.size(); ++i) {
    if (i > 0 && (digits.size() - i) % 3 == 0) text += ',';
    text += digits[i];
  }
  return text;
}

std::string Counted(std::uint64_t number, const char* one) {
  return fmt::format("{} {}{}", Count(number), one, number == 1 ? "" : "s");
}

/// Lifetimes and sizes come by powers of two.
std::string RangeOf(std::size_t log) {
  if (log == 0) return "0";
  const std::uint64_t low = std::uint64_t(1) << (log - 1);
  return low == 1 ? "1" : fmt::format("{} to {}", Count(low), Count(low + (low - 1)));
}

double Share(std::uint64_t part, std::uint64_t whole) {
  return whole == 0 ? 0 : 100 * static_cast<double>(part) / static_cast<double>(whole);
}

std::string Milliseconds(const Interval& seconds) {
  return fmt::format("{:+.1f} ms [{:+.1f}, {:+.1f}]", 1e3 * seconds.mean, 1e3 * seconds.low,
                     1e3 * seconds.high);
}

std::string SizesOf(const Site& site) {
  if (site.sizes.size() == 1 && site.otherSizes == 0) return Count(site.sizes.begin()->first);
  return fmt::format("{} to {}", Count(site.sizes.begin()->first), Count(site.maxSize));
}

void AddCounts(std::string& text, const char* title, const LogCounts& counts) {
  const std::uint64_t all = std::accumulate(counts.begin(), counts.end(), std::uint64_t(0));
  text += fmt::format("\n{}\n", title);
  std::uint64_t others = 0;
  const auto add = [&](std::string_view name, std::uint64_t count) {
    if (count > 0)
      text += fmt::format("  {:>26} {:>14} {:5.1f}%\n", name, Count(count), Share(count, all));
  };
  for (std::size_t i = 0; i < counts.size(); ++i)
    if (Share(counts[i], all) >= leastShare)
      add(RangeOf(i), counts[i]);
    else
      others += counts[i];
  add("others", others);
}

Json JsonOf(const Interval& interval) {
  return {{"mean", interval.mean}, {"low", interval.low}, {"high", interval.high}};
}

Json JsonOf(const LogCounts& counts) {
  Json list = Json::array();
  for (std::size_t i = 0; i < counts.size(); ++i)
    if (counts[i] > 0) list.push_back({{"range", RangeOf(i)}, {"log", i}, {"count", counts[i]}});
  return list;
}

/// Blocks by size and lifetime; those that are live at the end have none.
Json BlocksOf(const Statistics& all) {
  Json list = Json::array();
  for (std::size_t size = 0; size < all.sizes.size(); ++size) {
    std::uint64_t live = all.sizes[size];
    for (std::size_t i = 0; i < all.released[size].size(); ++i)
      if (const std::uint64_t count = all.released[size][i]; count > 0) {
        list.push_back({{"size", size}, {"lifetime", i}, {"count", count}});
        live -= count;
      }
    if (live > 0) list.push_back({{"size", size}, {"lifetime", nullptr}, {"count", live}});
  }
  return list;
}

Json JsonOf(const Outcome& outcome) {
  const Variant& variant = outcome.variant;
  return {{"name", variant.name},
          {"seconds", JsonOf(IntervalOf(variant.seconds))},
          {"difference", JsonOf(outcome.difference)},
          {"bytes", variant.bytes},
          {"bytesHeld", variant.bytesHeld},
          {"options", variant.pooled != 0 ? variant.settings.GetOptions() : ""},
          {"keys", variant.pooled != 0 ? variant.settings.GetKeys() : ""}};
}

std::string OutcomeLine(const Outcome& outcome) {
  return fmt::format("  {:<40} {:>9.1f} ms  {:<28} {:>10} KiB\n", outcome.variant.name,
                     1e3 * IntervalOf(outcome.variant.seconds).mean,
                     outcome.variant.name == "heap" ? "" : Milliseconds(outcome.difference),
                     Count(outcome.variant.bytes / 1024));
}

} // namespace

std::string Advice::GetAnswer() const {
  if (!request.measures) return "Nothing was measured.";
  if (!best) return "Don't: no call site has many small requests that a pool could serve.";
  const Interval whole = IntervalOf(heap.seconds);
  if (!Pays())
    return fmt::format("Don't: with the best pools found the heap's {:.1f} ms change by {}.",
                       1e3 * whole.mean, Milliseconds(GetForecast()));
  return fmt::format("A pool pays: {} of the heap's {:.1f} ms, as \"{}\".",
                     Milliseconds(GetForecast()), 1e3 * whole.mean, best->variant.name);
}

std::string Advice::GetText() const {
  std::string command;
  for (const std::string& argument : recording.command)
    command += (command.empty() ? "" : " ") + argument;
  const Statistics& all = statistics;
  std::string text = fmt::format("{}\n\nProgram    {}\n", GetAnswer(), command);
  text += fmt::format(
      "Recording  {} events{}{}\n", Count(recording.numEvents),
      recording.numLost > 0 ? fmt::format(", at least {} lost", Count(recording.numLost)) : "",
      recording.isCut ? "; it is cut, and read to its last whole block" : "");
  text += fmt::format("Requests   {} of {} bytes, {} of them realloc; {}\n", Count(all.requests),
                      Count(all.bytes), Count(all.reallocs), Counted(all.threads, "thread"));
  text += fmt::format("Peak       {} bytes live, after event {}\n", Count(all.peakBytes),
                      Count(all.peakEvent));
  text += fmt::format("At the end {} of {} live\n", Counted(all.live, "block"),
                      Counted(all.liveBytes, "byte"));
  AddCounts(text, "Size in bytes                     Requests", all.sizes);
  AddCounts(text, "Lifetime in requests              Releases", all.GetLifetimes());

  text += "\nCall sites, by requests\n";
  const auto isShown = [&](const SiteAdvice& one) {
    return Share(all.sites[one.site].requests, all.requests) >= leastShare;
  };
  const std::ptrdiff_t shown =
      std::max(std::ranges::count_if(sites, isShown), std::min(std::ssize(sites), leastShown));
  for (const SiteAdvice& one : std::span(sites).first(static_cast<std::size_t>(shown))) {
    const Site& site = all.sites[one.site];
    text +=
        fmt::format("  {:5.1f}%  {}\n", Share(site.requests, all.requests), site.where.GetText());
    if (const auto callers = all.GetCallers(one.site); !callers.front().first.empty())
      text += fmt::format("          from {}\n", callers.front().first);
    text += fmt::format("          {} of {} bytes, {} bytes at the peak\n",
                        Counted(site.requests, "request"), SizesOf(site), Count(site.bytesAtPeak));
    text += fmt::format("          {}: {}\n", one.verdict.isCandidate ? "could have a pool" : "no",
                        one.verdict.reason);
    if (one.seconds)
      text += fmt::format("          alone in a pool: {}\n", Milliseconds(*one.seconds));
  }
  if (shown < std::ssize(all.sites))
    text += fmt::format("  {} more, each with less than {:.0f}% of the requests\n",
                        Count(all.sites.size() - static_cast<std::size_t>(shown)), leastShare);
  if (outcomes.empty()) return text;

  text += fmt::format("\nReplayed: {}, {} rounds in one thread, each in a process of its own. "
                      "Intervals of 95%.\n",
                      IsWhole()
                          ? "the whole recording"
                          : fmt::format("events {} to {}", Count(part.first + 1), Count(part.last)),
                      request.rounds);
  text += fmt::format("  {:<40} {:>12}  {:<28} {:>14}\n", "", "time", "more than the heap",
                      "heap at peak");
  for (const Outcome& outcome : outcomes)
    text += OutcomeLine(outcome);
  if (!best) return text;
  text += fmt::format("\nThe best, measured again\n{}", OutcomeLine({heap, {}}));
  text += OutcomeLine(*best);
  text += fmt::format("Expected in the program: {}, wider by a quarter of it for what a replay "
                      "lacks\n",
                      Milliseconds(GetForecast()));
  if (!Pays()) return text;
  text += fmt::format("\nSettings   {}\nor keys    {}\n", best->variant.settings.GetOptions(),
                      best->variant.settings.GetKeys());
  text += "\nWhat to change\n";
  for (const std::string& change : GetChanges())
    text += fmt::format("  {}\n", change);
  return text;
}

nlohmann::ordered_json Advice::GetJson() const {
  const Statistics& all = statistics;
  Json json{{"answer", GetAnswer()},
            {"command", recording.command},
            {"events", recording.numEvents},
            {"lost", recording.numLost},
            {"cut", recording.isCut},
            {"threads", all.threads},
            {"requests", all.requests},
            {"releases", all.frees},
            {"reallocs", all.reallocs},
            {"bytes", all.bytes},
            {"peakBytes", all.peakBytes},
            {"peakEvent", all.peakEvent},
            {"live", all.live},
            {"liveBytes", all.liveBytes},
            {"sizes", JsonOf(all.sizes)},
            {"lifetimes", JsonOf(all.GetLifetimes())},
            {"blocks", BlocksOf(all)}};
  json["sites"] = Json::array();
  for (const SiteAdvice& one : sites) {
    const Site& site = all.sites[one.site];
    Json entry{{"where", site.where.GetText()},
               {"file", site.where.file},
               {"line", site.where.line},
               {"callers", Json::array()},
               {"requests", site.requests},
               {"bytes", site.bytes},
               {"sizes", SizesOf(site)},
               {"releases", site.frees},
               {"freedTogether", site.freedTogether},
               {"freedElsewhere", site.freedElsewhere},
               {"peakBytes", site.peakBytes},
               {"bytesAtPeak", site.bytesAtPeak},
               {"liveAtEnd", site.live},
               {"lifetimes", JsonOf(site.lifetimes)},
               {"candidate", one.verdict.isCandidate},
               {"reason", one.verdict.reason},
               {"chosen", one.isChosen},
               {"change", one.change}};
    for (const auto& [caller, count] : all.GetCallers(one.site))
      entry["callers"].push_back({{"from", caller}, {"requests", count}});
    if (one.seconds) entry["difference"] = JsonOf(*one.seconds);
    json["sites"].push_back(std::move(entry));
  }
  json["samples"] = Json::array();
  for (const Sample& sample : all.samples) {
    Json entry{{"event", sample.event}, {"time", sample.time}, {"bytes", Json::array()}};
    std::uint64_t other = 0; // of sites that aren't shown
    for (const std::uint64_t bytes : sample.liveBytes)
      other += bytes;
    for (const SiteAdvice& one : sites) {
      const std::uint64_t bytes =
          one.site < sample.liveBytes.size() ? sample.liveBytes[one.site] : 0;
      entry["bytes"].push_back(bytes);
      other -= bytes;
    }
    entry["bytes"].push_back(other);
    json["samples"].push_back(std::move(entry));
  }
  if (outcomes.empty()) return json;
  json["replay"] = {{"whole", IsWhole()},
                    {"first", part.first + 1},
                    {"last", std::min(part.last, recording.numEvents)},
                    {"rounds", request.rounds},
                    {"pays", Pays()},
                    {"variants", Json::array()}};
  for (const Outcome& outcome : outcomes)
    json["replay"]["variants"].push_back(JsonOf(outcome));
  if (best) {
    json["replay"]["heap"] = JsonOf(Outcome{heap, {}});
    json["replay"]["best"] = JsonOf(*best);
    json["replay"]["forecast"] = JsonOf(GetForecast());
    json["replay"]["changes"] = GetChanges();
  }
  return json;
}

} // namespace VOK::MemPool::Tools
