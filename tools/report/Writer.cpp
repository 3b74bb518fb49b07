#include "report/Formats.h"

#include "report/Form.h"

#include <algorithm>
#include <fmt/format.h>
#include <iterator>

namespace VOK::MemPool::Tools {

namespace {

/// Writes the values of a header block, or of the rows of a table.
class Values {
public:
  Values(std::string& text_, std::string_view indent_, std::span<const Column> columns_ = {})
      : text(text_), indent(indent_), columns(columns_) {}

  void Line(const char* label, const char*, Number number) {
    Append("{}{}{:>8}\n", indent, label, number);
  }
  void Line(const char* label, const char*, Address address) {
    Append("{}{}{}\n", indent, label, AddressText(address));
  }
  void Line(const char* label, const char*, const std::string& value) {
    Append("{}{}{}\n", indent, label, value);
  }

  void BeginRow() {
    next = 0;
    text += indent;
  }
  template <class Value>
  void Cell(const char* key, const Value& value) {
    LastCell(key, value);
    text += ' ';
  }
  void LastCell(const char*, Number number) { Append("{:>{}}", number, NextWidth()); }
  void LastCell(const char*, Id id) { Append("{:0{}}", id.value, NextWidth()); }
  void LastCell(const char*, Address address) {
    Append("{:>{}}", AddressText(address), NextWidth());
  }
  void LastCell(const char*, Type type) { Append("{:>{}}", TypeText(type), NextWidth()); }
  void LastCell(const char*, Percent percent) {
    const std::string number =
        fmt::format("{}.{:03}", percent.thousandths / 1000, percent.thousandths % 1000);
    Append("{:>{}}%", number, NextWidth() - 1);
  }
  void LastCell(const char*, Bar bar) {
    text.append(bar.stars, '*');
    if (bar.more) text += '+';
  }
  bool HasCells(const char*, int cells, bool present) {
    for (; !present && cells > 0; --cells)
      Append("{:>{}} ", "", NextWidth());
    return present;
  }

private:
  int NextWidth() { return columns[next++].width; }

  template <class... Args>
  void Append(fmt::format_string<Args...> format, Args&&... args) {
    fmt::format_to(std::back_inserter(text), format, std::forward<Args>(args)...);
  }

  std::string& text;
  const std::string_view indent;
  const std::span<const Column> columns;
  std::size_t next = 0;
};

template <class Row>
void WriteTable(std::string& text, const Table<Row>& table) {
  text += HeadingLine(ColumnsOf<Row>()) + "\n" + RuleLine(ColumnsOf<Row>()) + "\n";
  Values values(text, tableIndent, ColumnsOf<Row>());
  for (const Row& row : table.rows) {
    values.BeginRow();
    VisitCells(row, values);
    text += '\n';
  }
}

void WriteWarning(std::string& text, const std::optional<Warning>& warning, char relation) {
  if (!warning) return;
  text += fmt::format("{}{:>{}}: {}{} {} {}\n", warningStart, warning->source, warningWidth,
                      warning->text, warning->count, relation, warning->total);
}

/// The four lines of a grid row.
void WriteMapRow(std::string& text, std::span<const Box> boxes, Number label) {
  std::string types(mapMargin);
  std::string offsets(mapMargin);
  std::string numbers(mapMargin);
  std::string sizes = fmt::format("{:>4} {}", label, wall);
  for (const Box& box : boxes) {
    types += fmt::format("{:<8}{}", fmt::format("{}{}", TypeText(box.type), box.isHead ? " +" : ""),
                         wall);
    offsets += fmt::format("o={:<6}{}", box.offset, wall);
    sizes += fmt::format("s={:<6}{}", box.size, wall);
    numbers += fmt::format("{}={:<6}{}", box.tag, box.number, wall);
  }
  for (const std::string& line : {types, offsets, sizes, numbers})
    text += line + "\n";
}

void WriteMap(std::string& text, const Map& map) {
  const std::span<const Box> boxes = map.boxes;
  const std::size_t rest = boxes.size() % Map::boxesPerRow;
  const std::size_t fullRows = boxes.size() / Map::boxesPerRow;
  text += MapHeading(map.columns) + "\n";
  for (std::size_t row = 0; row < fullRows; ++row) {
    text += MapRule(Map::boxesPerRow) + "\n";
    WriteMapRow(text, boxes.subspan(row * Map::boxesPerRow, Map::boxesPerRow), map.labels[row]);
  }
  text += MapRule(map.columns) + "\n";
  if (rest == 0) return;
  WriteMapRow(text, boxes.last(rest), map.labels[fullRows]);
  text += MapRule(rest) + "\n";
}

void WriteBucket(std::string& text, const BucketReport& bucket) {
  const std::string mark = BucketMark(bucket.number);
  const auto title = [&](const char* section, Number count) {
    text += fmt::format("\n{}{}{})\n", mark, section, count);
  };
  text += "\n" + mark + "\n";
  Values header(text, bucketIndent);
  VisitLines(bucket, header);
  title(BucketTitle::records, bucket.records.count);
  WriteTable(text, bucket.records);
  WriteWarning(text, bucket.recordsWarning, '<');
  title(BucketTitle::histogram, bucket.histogram.count);
  WriteTable(text, bucket.histogram);
  title(BucketTitle::map, bucket.map.count);
  WriteMap(text, bucket.map);
  title(BucketTitle::freeList, bucket.freeList.count);
  WriteTable(text, bucket.freeList);
  WriteWarning(text, bucket.freeListWarning, '>');
  text += '\n';
}

std::string WithCrLf(const std::string& text) {
  std::string result;
  for (const char c : text) {
    if (c == '\n') result += '\r';
    result += c;
  }
  return result;
}

} // namespace

std::string WriteReport(const Report& report) {
  std::string text = fmt::format("{}{}\n", PoolTitle::pool, report.name);
  Values header(text, headerIndent);
  VisitLines(report, header);
  text += fmt::format("\n{}{}{})\n", histogramIndent, PoolTitle::histogram, report.histogram.count);
  WriteTable(text, report.histogram);
  text += fmt::format("\n{}{}{})\n", titleIndent, PoolTitle::buckets, report.buckets.count);
  WriteTable(text, report.buckets);
  text += fmt::format("\n{}{}{},{})\n", titleIndent, PoolTitle::freeBuckets,
                      report.freeBuckets.count, report.freeBucketsM);
  WriteTable(text, report.freeBuckets);
  text += fmt::format("\n\n{}{}{})\n", titleIndent, PoolTitle::extRecs, report.extRecs.count);
  WriteTable(text, report.extRecs);
  text += '\n';
  for (const BucketReport& bucket : report.bucketReports)
    WriteBucket(text, bucket);
  return report.isCrLf ? WithCrLf(text) : text;
}

} // namespace VOK::MemPool::Tools
