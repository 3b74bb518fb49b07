#include "report/Formats.h"

#include "common/Tool.h"
#include "report/Form.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <fmt/format.h>
#include <limits>
#include <nlohmann/json.hpp>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

using Json = nlohmann::json;

[[noreturn]] void Refuse(const std::string& key, const char* expected) {
  throw Failure(fmt::format("not a document of reports: \"{}\" is not {}", key, expected));
}

bool IsTrue(const Json& object, const char* key) {
  return object.contains(key) && object.at(key) == true;
}

std::string BytesOf(const std::string& key, const std::string& hex) {
  std::string bytes;
  for (std::size_t i = 0; i < hex.size(); i += 2) {
    unsigned char byte = 0;
    const char* const end = hex.data() + std::min(i + 2, hex.size());
    if (std::from_chars(hex.data() + i, end, byte, 16).ptr != hex.data() + i + 2)
      Refuse(key, "pairs of hexadecimal digits");
    bytes += static_cast<char>(byte);
  }
  return bytes;
}

class Getter {
public:
  explicit Getter(const Json& object_) : object(object_) {}

  void Get(const std::string& key, std::string& text) const {
    const std::string bytes = key + textBytes;
    text = object.contains(bytes) ? BytesOf(bytes, object.at(bytes).get<std::string>())
                                  : object.at(key).get<std::string>();
  }
  void GetLine(const std::string& key, std::string& text) const {
    Get(key, text);
    if (text.find('\n') != std::string::npos) Refuse(key, "a text of one line");
  }
  void Get(const std::string& key, Number& number) const {
    const Json& json = object.at(key);
    if (!json.is_number_unsigned() ||
        json.get<std::uint64_t>() > std::numeric_limits<Number>::max())
      Refuse(key, "a number from 0 to 4294967295");
    number = json.get<Number>();
  }
  void Get(const std::string& key, Id& id) const { Get(key, id.value); }
  void Get(const std::string& key, Address& address) const {
    address = {};
    if (object.at(key).is_null()) return;
    const auto text = object.at(key).get<std::string>();
    const char* const end = text.data() + text.size();
    if (!text.starts_with("0x") ||
        std::from_chars(text.data() + 2, end, address.value, 16).ptr != end)
      Refuse(key, "null or an address");
  }
  void Get(const std::string& key, Type& type) const {
    const auto text = object.at(key).get<std::string>();
    for (const Type known : {Type::Free, Type::Used, Type::Ext, Type::Unknown})
      if (text == TypeText(known)) {
        type = known;
        return;
      }
    Refuse(key, "a record's type");
  }
  void Get(const std::string& key, Percent& percent) const {
    const double value = object.at(key).get<double>();
    if (!(value >= 0 && value < static_cast<double>(maxPercent) + 1)) Refuse(key, "a percentage");
    percent.thousandths = static_cast<std::uint64_t>(std::llround(value * 1000));
  }
  void Get(const std::string& key, Bar& bar) const {
    Get(key, bar.stars);
    if (bar.stars < 1 || bar.stars > maxStars) Refuse(key, "a bar of 1 to 100 stars");
    bar.more = IsTrue(object, "more");
  }

  void Line(const char*, const char* key, std::string& text) const { GetLine(key, text); }
  template <class Value>
  void Line(const char*, const char* key, Value& value) const {
    Get(key, value);
  }
  template <class Value>
  void Cell(const char* key, Value& value) const {
    Get(key, value);
  }
  template <class Value>
  void LastCell(const char* key, Value& value) const {
    Get(key, value);
  }
  bool HasCells(const char* key, int, bool& present) const {
    return present = object.contains(key);
  }

private:
  const Json& object;
};

template <class Row>
void FromJson(const Json& json, Table<Row>& table) {
  Getter(json).Get("count", table.count);
  for (const Json& object : json.at("rows")) {
    Row row{};
    const Getter getter(object);
    VisitCells(row, getter);
    table.rows.push_back(row);
  }
}

template <class Row>
void FromJson(const Json& json, Table<Row>& table, std::optional<Warning>& warning) {
  FromJson(json, table);
  if (!json.contains("warning")) return;
  const Getter getter(json.at("warning"));
  warning.emplace();
  getter.Get("source", warning->source);
  getter.GetLine("text", warning->text);
  getter.Get("count", warning->count);
  getter.Get("total", warning->total);
}

void FromJson(const Json& json, Map& map) {
  Getter(json).Get("count", map.count);
  Getter(json).Get("columns", map.columns);
  if (map.columns > Map::boxesPerRow) Refuse("columns", "a number from 0 to 8");
  for (const Json& label : json.at("labels")) {
    const Json object = {{"labels", label}};
    Getter(object).Get("labels", map.labels.emplace_back());
  }
  for (const Json& object : json.at("boxes")) {
    const Getter getter(object);
    Box box{};
    std::string tag;
    getter.Get("type", box.type);
    box.isHead = object.at("isHead").get<bool>();
    getter.Get("offset", box.offset);
    getter.Get("size", box.size);
    getter.Get("tag", tag);
    if (tag != "n" && tag != "d" && tag != "u") Refuse("tag", "one of n, d, u");
    box.tag = tag.front();
    getter.Get("number", box.number);
    map.boxes.push_back(box);
  }
  if (map.labels.size() != (map.boxes.size() + Map::boxesPerRow - 1) / Map::boxesPerRow)
    Refuse("labels", "one number for each 8 boxes");
}

void FromJson(const Json& json, BucketReport& bucket) {
  Getter(json).Get("number", bucket.number);
  const Getter header(json.at("header"));
  VisitLines(bucket, header);
  FromJson(json.at("records"), bucket.records, bucket.recordsWarning);
  FromJson(json.at("histogram"), bucket.histogram);
  FromJson(json.at("map"), bucket.map);
  FromJson(json.at("freeList"), bucket.freeList, bucket.freeListWarning);
}

void FromJson(const Json& json, Report& report) {
  Getter(json).Get("name", report.name);
  report.isCrLf = IsTrue(json, "crlf");
  const Getter header(json.at("header"));
  VisitLines(report, header);
  FromJson(json.at("histogram"), report.histogram);
  FromJson(json.at("buckets"), report.buckets);
  FromJson(json.at("freeBuckets"), report.freeBuckets);
  Getter(json.at("freeBuckets")).Get("freeBucksM", report.freeBucketsM);
  FromJson(json.at("extRecs"), report.extRecs);
  if (!json.at("bucketReports").empty()) Refuse("bucketReports", "an array of objects");
  const std::size_t count = report.bucketReports.size();
  if (count > 0 && count < report.buckets.rows.size())
    Refuse("bucketReports", "empty or an object for each bucket");
}

/// Where a document can't be read on.
std::string PlaceOf(std::string_view document, std::size_t byte) {
  const std::string_view before = document.substr(0, byte > 0 ? byte - 1 : 0);
  const auto line = std::count(before.begin(), before.end(), '\n') + 1;
  const std::size_t lineBegin = before.rfind('\n') + 1; // 0 if there is none
  return fmt::format("line {}, column {}", line, before.size() - lineBegin + 1);
}

/// The key in a message of the JSON library.
std::string LastQuoted(std::string_view message) {
  const std::size_t end = message.rfind('\'');
  const std::size_t begin = message.rfind('\'', end - 1) + 1;
  return fmt::format("\"{}\"", message.substr(begin, end - begin));
}

/// Takes the reports out of a document while it is parsed, bucket by bucket, and leaves in each
/// array what isn't one: as values of the parser a large report takes many times its own size.
class Collector {
public:
  std::vector<Report> reports;

  bool Take(int depth, Json::parse_event_t event, const Json& parsed) {
    if (event == Json::parse_event_t::key && depth == 1) isInReports = parsed == "reports";
    if (event == Json::parse_event_t::key && depth == 3) isInBuckets = parsed == "bucketReports";
    if (event != Json::parse_event_t::object_end || !isInReports) return true;
    if (depth == 4 && isInBuckets) {
      FromJson(parsed, report.bucketReports.emplace_back());
      return false;
    }
    if (depth != 2) return true;
    FromJson(parsed, report);
    report.line = nextLine;
    nextLine = NumberLines(report);
    reports.push_back(std::exchange(report, {}));
    return false;
  }

private:
  bool isInReports = false, isInBuckets = false;
  Report report; ///< as far as it is read
  std::size_t nextLine = 1;
};

} // namespace

ReportText ReadJson(std::string_view document) {
  Collector collector;
  try {
    const Json json =
        Json::parse(document, [&](int depth, Json::parse_event_t event, const Json& parsed) {
          return collector.Take(depth, event, parsed);
        });
    if (!json.at("reports").empty()) Refuse("reports", "an array of objects");
  } catch (const Json::parse_error& error) {
    return {{}, "not a JSON document: " + PlaceOf(document, error.byte)};
  } catch (const Json::out_of_range& error) {
    constexpr int noKey = 403;
    return {{},
            "not a document of reports: " + (error.id == noKey
                                                 ? "it lacks " + LastQuoted(error.what())
                                                 : "a number is too large")};
  } catch (const Json::exception&) {
    return {{}, "not a document of reports: a value has another type than in one of --json"};
  } catch (const Failure& failure) {
    return {{}, failure.what()};
  }
  return {std::move(collector.reports), ""};
}

} // namespace VOK::MemPool::Tools
