#include "report/Lines.h"

#include "report/Form.h"
#include "report/Formats.h"

#include <algorithm>
#include <fmt/format.h>
#include <span>

namespace VOK::MemPool::Tools {

namespace {

/// Takes the lines of a header block.
class HeaderValues {
public:
  HeaderValues(Lines& lines_, std::string_view indent_) : lines(lines_), indent(indent_) {}

  void Line(const char* label, const char*, Number& number) {
    Take(label, [&](Fields& fields) { number = fields.TakeNumber(8); });
  }
  void Line(const char* label, const char*, Address& address) {
    Take(label, [&](Fields& fields) { address = fields.TakeAddress(); });
  }
  void Line(const char* label, const char*, std::string& text) {
    Take(label, [&](Fields& fields) { text = fields.TakeRest(); });
  }

private:
  template <class TakeValue>
  void Take(const char* label, TakeValue takeValue) {
    const std::string start = fmt::format("{}{}", indent, label);
    Fields fields(lines, fmt::format("\"{}\"", start));
    fields.TakeText(start);
    takeValue(fields);
    fields.TakeEnd();
    lines.Skip();
  }

  Lines& lines;
  const std::string_view indent;
};

/// Takes the cells of a table's row.
class RowValues {
public:
  RowValues(Fields& fields_, std::span<const Column> columns_)
      : fields(fields_), columns(columns_) {}

  template <class Value>
  void Cell(const char* key, Value& value) {
    LastCell(key, value);
    fields.TakeText(" ");
  }
  void LastCell(const char*, Number& number) { number = fields.TakeNumber(NextWidth()); }
  void LastCell(const char*, Id& id) { id = fields.TakeId(NextWidth()); }
  void LastCell(const char*, Address& address) { address = fields.TakeAddress(NextWidth()); }
  void LastCell(const char*, Type& type) { type = fields.TakeType(NextWidth()); }
  void LastCell(const char*, Percent& percent) {
    percent = fields.TakePercent(NextWidth() - 1);
    fields.TakeText("%");
  }
  void LastCell(const char*, Bar& bar) { bar = fields.TakeBar(); }
  bool HasCells(const char*, int cells, bool& present) {
    std::size_t width = 0;
    for (int i = 0; i < cells; ++i)
      width += static_cast<std::size_t>(columns[static_cast<std::size_t>(i)].width) + 1;
    const std::string spaces(width, ' ');
    present = !fields.StartsWith(spaces);
    if (present) return true;
    fields.TakeText(spaces);
    next = static_cast<std::size_t>(cells);
    return false;
  }

private:
  int NextWidth() { return columns[next++].width; }

  Fields& fields;
  const std::span<const Column> columns;
  std::size_t next = 0;
};

// The grid of a record map.

/// Skips a line that repeats one piece, and returns how often.
std::size_t TakePieces(Lines& lines, std::string (*form)(std::size_t)) {
  constexpr std::size_t margin = 6;
  constexpr std::size_t piece = 10;
  lines.CheckWhole("a line of the record map");
  const std::size_t size = std::max(lines.Get().size(), margin);
  const std::size_t blanks =
      lines.isLenient ? piece - 1 : 0; // of the last piece, as far as it goes
  const std::size_t count = std::min((size + blanks - margin) / piece, Map::boxesPerRow);
  lines.SkipExactly(form(count));
  return count;
}

/// Takes a value per box from the rest of the line.
template <class TakeValue>
void TakeBoxes(Lines& lines, Fields& fields, std::span<Box> boxes, TakeValue takeValue) {
  for (Box& box : boxes) {
    takeValue(box);
    fields.TakeText(wall);
  }
  fields.TakeEnd();
  lines.Skip();
}

Number TakeTagged(Fields& fields, std::string_view tag) {
  fields.TakeText(tag);
  return fields.TakeLeftNumber(6);
}

Fields BeginLine(const Lines& lines) {
  Fields fields(lines, "a row of the record map");
  fields.TakeText(mapMargin);
  return fields;
}

/// Adds the boxes of the present line to the map.
void TakeTypes(Lines& lines, Map& map) {
  Fields fields = BeginLine(lines);
  do {
    Box box{};
    box.type = fields.TakeLeftType(8, box.isHead);
    fields.TakeText(wall);
    map.boxes.push_back(box);
  } while (!fields.AtEnd() && map.boxes.size() % Map::boxesPerRow != 0);
  fields.TakeEnd();
  lines.Skip();
}

/// Takes the four lines of a grid row, and returns the number of its boxes.
std::size_t TakeRow(Lines& lines, Map& map) {
  const std::size_t first = map.boxes.size();
  TakeTypes(lines, map);
  const std::span<Box> boxes = std::span(map.boxes).subspan(first);

  Fields offsets = BeginLine(lines);
  TakeBoxes(lines, offsets, boxes, [&](Box& box) { box.offset = TakeTagged(offsets, "o="); });

  Fields sizes(lines, "a row of the record map");
  map.labels.push_back(sizes.TakeNumber(4));
  sizes.TakeText(" ");
  sizes.TakeText(wall);
  TakeBoxes(lines, sizes, boxes, [&](Box& box) { box.size = TakeTagged(sizes, "s="); });

  Fields numbers = BeginLine(lines);
  TakeBoxes(lines, numbers, boxes, [&](Box& box) {
    box.tag = numbers.TakeOneOf("ndu");
    box.number = TakeTagged(numbers, "=");
  });
  return boxes.size();
}

/// Adds the grid that begins in the present line to the map.
void ReadGrid(Lines& lines, Map& map) {
  map.columns = static_cast<Number>(TakePieces(lines, MapHeading));
  for (;;) {
    const Lines rule = lines;
    const std::size_t width = TakePieces(lines, MapRule);
    const std::size_t boxes = lines.StartsWith(mapMargin) ? TakeRow(lines, map) : 0;
    const bool isFull = boxes == Map::boxesPerRow;
    const std::size_t expected = isFull ? Map::boxesPerRow : map.columns;
    if (width != expected) rule.Fail(fmt::format("a rule over {} boxes", expected));
    if (isFull) continue;
    if (boxes > 0) lines.SkipExactly(MapRule(boxes));
    return;
  }
}

class Reader {
public:
  explicit Reader(Lines& lines_) : lines(lines_) {}

  std::optional<Report> ReadNext(std::size_t& title) {
    for (; !lines.AtEnd(); lines.Skip())
      if (const std::size_t column = FindTitle(); column != std::string_view::npos) {
        title = lines.GetNumber();
        Report report;
        ReadReport(column, report);
        return report;
      }
    return std::nullopt;
  }

private:
  static std::string VersionStart() {
    return fmt::format("{}{}", headerIndent, PoolLabel::version);
  }

  /// The column at which a report starts in the present line. After other text of a program it
  /// starts only if its next line follows.
  std::size_t FindTitle() const {
    const std::size_t title = lines.Get().find(PoolTitle::pool);
    if (title == 0) return 0;
    if (title != std::string_view::npos && lines.GetSecond().starts_with(VersionStart()))
      return title;
    if (lines.isLenient) return std::string_view::npos;
    for (const char* const start : {PoolLabel::version, PoolTitle::buckets, PoolTitle::freeBuckets,
                                    PoolTitle::extRecs, BucketTitle::bucket})
      if (lines.StartsWith(fmt::format("{}{}", headerIndent, start)))
        lines.Fail(fmt::format("\"{}\" at a report's beginning before this", PoolTitle::pool));
    return std::string_view::npos;
  }

  /// A name may hold line ends, so it reaches to the next line of the block; but to a lenient
  /// reading a line in between is another's.
  void ReadName(std::size_t title, Report& report) {
    report.line = lines.GetNumber();
    report.name = lines.Get().substr(title + std::string_view(PoolTitle::pool).size());
    lines.Skip();
    const Lines afterTitle = lines;
    while (!lines.StartsWith(VersionStart())) {
      if (lines.AtEnd() || lines.StartsWith(PoolTitle::pool) || lines.isLenient)
        afterTitle.Fail(fmt::format("\"{}\"", VersionStart()));
      report.name += fmt::format("\n{}", lines.Get());
      lines.Skip();
    }
    report.isCrLf = lines.Get().ends_with('\r');
    if (report.isCrLf) RemoveCr(report.name, afterTitle);
    lines.isCrLf = report.isCrLf;
  }

  static void RemoveCr(std::string& name, const Lines& afterTitle) {
    std::string result;
    name += '\n';
    for (std::size_t i = 0; i < name.size(); ++i) {
      if (name[i] == '\n' && (i == 0 || name[i - 1] != '\r'))
        afterTitle.Fail("a line end of CR and LF before this");
      if (name[i] != '\r' || name[i + 1] != '\n') result += name[i];
    }
    result.pop_back();
    name = result;
  }

  void ReadReport(std::size_t title, Report& report) {
    ReadName(title, report);
    HeaderValues header(lines, headerIndent);
    VisitLines(report, header);
    ReadTable(fmt::format("{}{}", histogramIndent, PoolTitle::histogram), report.histogram);
    ReadTable(fmt::format("{}{}", titleIndent, PoolTitle::buckets), report.buckets);
    ReadTable(fmt::format("{}{}", titleIndent, PoolTitle::freeBuckets), report.freeBuckets,
              &report.freeBucketsM);
    lines.SkipExactly("");
    ReadTable(fmt::format("{}{}", titleIndent, PoolTitle::extRecs), report.extRecs);
    lines.SkipExactly("");
    while (IsBucketNext()) {
      report.bucketReports.emplace_back();
      ReadBucket(report.bucketReports.back());
    }
    CheckAllBuckets(report);
    NumberLines(report);
    lines.isCrLf = false;
  }

  /// After an empty line; to a lenient reading after few lines of others, too.
  bool IsBucketNext() const {
    const std::string mark = fmt::format("{}{}", titleIndent, BucketTitle::bucket);
    if (!lines.isLenient) return lines.Get().empty() && lines.GetSecond().starts_with(mark);
    Lines next = lines;
    for (int most = 10; most > 0 && !next.StartsWith(PoolTitle::pool); --most, next.Skip())
      if (next.StartsWith(mark)) return true;
    return false;
  }

  /// The detailed form has a report of each bucket, so a smaller number is a cut.
  void CheckAllBuckets(const Report& report) {
    const std::size_t count = report.bucketReports.size();
    if (count == 0 || count >= report.buckets.rows.size()) return;
    lines.SkipExactly("");
    lines.SkipExactly(BucketMark(static_cast<Number>(count + 1)));
  }

  void ReadBucket(BucketReport& bucket) {
    lines.SkipExactly("");
    Fields title(lines, "a bucket's title");
    title.TakeText(fmt::format("{}{}", titleIndent, BucketTitle::bucket));
    bucket.number = title.TakeId(3).value;
    title.TakeEnd();
    lines.Skip();
    HeaderValues header(lines, bucketIndent);
    VisitLines(bucket, header);
    const std::string mark = BucketMark(bucket.number);
    ReadTable(mark + BucketTitle::records, bucket.records);
    ReadWarning(bucket.recordsWarning, " < ");
    ReadTable(mark + BucketTitle::histogram, bucket.histogram);
    ReadTitle(mark + BucketTitle::map, bucket.map);
    ReadGrid(lines, bucket.map);
    ReadTable(mark + BucketTitle::freeList, bucket.freeList);
    ReadWarning(bucket.freeListWarning, " > ");
    lines.SkipExactly("");
  }

  /// A title after an empty line; `second` is for a number after the count.
  template <class Section>
  void ReadTitle(const std::string& start, Section& section, Number* second = nullptr) {
    lines.SkipExactly("");
    Fields title(lines, fmt::format("\"{}\"", start));
    title.TakeText(start);
    section.count = title.TakeNumber();
    if (second != nullptr) {
      title.TakeText(",");
      *second = title.TakeNumber();
    }
    title.TakeText(")");
    title.TakeEnd();
    lines.Skip();
  }

  template <class Row>
  void ReadTable(const std::string& title, Table<Row>& table, Number* second = nullptr) {
    ReadTitle(title, table, second);
    lines.SkipExactly(HeadingLine(ColumnsOf<Row>()));
    lines.SkipExactly(RuleLine(ColumnsOf<Row>()));
    while (!lines.Get().empty() && !lines.StartsWith(warningStart)) {
      Row row{};
      Fields fields(lines, "a row");
      fields.TakeText(tableIndent);
      RowValues values(fields, ColumnsOf<Row>());
      VisitCells(row, values);
      fields.TakeEnd();
      table.rows.push_back(row);
      lines.Skip();
    }
  }

  /// A text, a count, a relation, a total; the text is all that precedes the count.
  void ReadWarning(std::optional<Warning>& warning, std::string_view relation) {
    if (!lines.StartsWith(warningStart)) return;
    Fields fields(lines, "a warning");
    fields.TakeText(warningStart);
    warning.emplace();
    warning->source = fields.TakeNumber(warningWidth);
    fields.TakeText(": ");
    const std::string_view start = fields.GetRest().substr(0, fields.GetRest().rfind(relation));
    const std::size_t count = start.find_last_not_of("0123456789") + 1; // 0 if there is no other
    warning->text = fields.TakeFirst(count);
    warning->count = fields.TakeNumber();
    fields.TakeText(relation);
    warning->total = fields.TakeNumber();
    fields.TakeEnd();
    lines.Skip();
  }

  Lines& lines;
};

} // namespace

std::optional<Report> TakeReport(Lines& lines, std::size_t& title) {
  return Reader(lines).ReadNext(title);
}

ReportText ReadReports(std::string_view text) {
  ReportText result;
  Lines lines(text);
  std::size_t title = 0;
  try {
    while (std::optional<Report> report = TakeReport(lines, title))
      result.reports.push_back(std::move(*report));
  } catch (const LineFailure& failure) {
    result.cut = fmt::format("line {}: {}", failure.line, failure.what());
  }
  return result;
}

} // namespace VOK::MemPool::Tools
