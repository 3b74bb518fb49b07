#include "report/Formats.h"

#include "report/Form.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>
#include <utility>

namespace VOK::MemPool::Tools {

namespace {

using Json = nlohmann::ordered_json;

/// Bytes that aren't UTF-8 are replaced.
std::string TextOf(const Json& json) {
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

bool IsUtf8(const std::string& text) {
  try {
    return !Json(text).dump().empty();
  } catch (const Json::type_error&) {
    return false;
  }
}

std::string HexOf(std::string_view bytes) {
  std::string hex;
  for (const char byte : bytes)
    hex += fmt::format("{:02x}", static_cast<unsigned char>(byte));
  return hex;
}

Json ToJson(Number number) { return number; }
Json ToJson(Id id) { return id.value; }
Json ToJson(Type type) { return TypeText(type); }
Json ToJson(Percent percent) { return static_cast<double>(percent.thousandths) / 1000; }
Json ToJson(Address address) {
  return address.value == 0 ? Json() : Json(fmt::format("{:#x}", address.value));
}

class Putter {
public:
  explicit Putter(Json& object_) : object(object_) {}

  void Text(const std::string& key, const std::string& text) {
    object[key] = text;
    if (!IsUtf8(text)) object[key + textBytes] = HexOf(text);
  }

  void Line(const char*, const char* key, const std::string& text) { Text(key, text); }
  template <class Value>
  void Line(const char*, const char* key, const Value& value) {
    object[key] = ToJson(value);
  }
  void LastCell(const char* key, Bar bar) {
    object[key] = bar.stars;
    if (bar.more) object["more"] = true;
  }
  template <class Value>
  void LastCell(const char* key, const Value& value) {
    object[key] = ToJson(value);
  }
  template <class Value>
  void Cell(const char* key, const Value& value) {
    LastCell(key, value);
  }
  bool HasCells(const char*, int, bool present) { return present; }

private:
  Json& object;
};

template <class Row>
Json ToJson(const Table<Row>& table) {
  Json json = {{"count", table.count}, {"rows", Json::array()}};
  for (const Row& row : table.rows) {
    Json object = Json::object();
    Putter putter(object);
    VisitCells(row, putter);
    json["rows"].push_back(std::move(object));
  }
  return json;
}

template <class Row>
Json ToJson(const Table<Row>& table, const std::optional<Warning>& warning) {
  Json json = ToJson(table);
  if (!warning) return json;
  Json object = {{"source", warning->source}};
  Putter(object).Text("text", warning->text);
  object["count"] = warning->count;
  object["total"] = warning->total;
  json["warning"] = std::move(object);
  return json;
}

Json ToJson(const Map& map) {
  Json boxes = Json::array();
  for (const Box& box : map.boxes)
    boxes.push_back({{"type", TypeText(box.type)},
                     {"isHead", box.isHead},
                     {"offset", box.offset},
                     {"size", box.size},
                     {"tag", std::string(1, box.tag)},
                     {"number", box.number}});
  return {{"count", map.count}, {"columns", map.columns}, {"labels", map.labels}, {"boxes", boxes}};
}

Json ToJson(const BucketReport& bucket) {
  Json json = {{"number", bucket.number}, {"header", Json::object()}};
  Putter header(json["header"]);
  VisitLines(bucket, header);
  json["records"] = ToJson(bucket.records, bucket.recordsWarning);
  json["histogram"] = ToJson(bucket.histogram);
  json["map"] = ToJson(bucket.map);
  json["freeList"] = ToJson(bucket.freeList, bucket.freeListWarning);
  return json;
}

/// A report without its buckets' reports.
Json HeadOf(const Report& report) {
  Json json = {{"line", report.line}, {"crlf", report.isCrLf}};
  Putter(json).Text("name", report.name);
  Putter header(json["header"] = Json::object());
  VisitLines(report, header);
  json["histogram"] = ToJson(report.histogram);
  json["buckets"] = ToJson(report.buckets);
  json["freeBuckets"] = ToJson(report.freeBuckets);
  json["freeBuckets"]["freeBucksM"] = report.freeBucketsM;
  json["extRecs"] = ToJson(report.extRecs);
  return json;
}

} // namespace

void WriteJson(const std::vector<Report>& reports,
               const std::function<void(std::string_view)>& write) {
  write("{\"reports\":[");
  std::string separator = "\n";
  for (const Report& report : reports) {
    std::string head = TextOf(HeadOf(report));
    head.back() = ','; // for its last member, which goes out bucket by bucket
    write(std::exchange(separator, ",\n") + head + "\"bucketReports\":[");
    std::string bucketSeparator = "\n";
    for (const BucketReport& bucket : report.bucketReports)
      write(std::exchange(bucketSeparator, ",\n") + TextOf(ToJson(bucket)));
    write("]}");
  }
  write("]}\n");
}

} // namespace VOK::MemPool::Tools
