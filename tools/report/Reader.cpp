#include "report/Reader.h"

#include "report/FixedLines.h"
#include "report/Form.h"
#include "report/Grid.h"
#include "report/Lines.h"

#include <fmt/format.h>

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
    const std::string blanks(width, ' ');
    present = !fields.StartsWith(blanks);
    if (present) return true;
    fields.TakeText(blanks);
    next = static_cast<std::size_t>(cells);
    return false;
  }

private:
  int NextWidth() { return columns[next++].width; }

  Fields& fields;
  const std::span<const Column> columns;
  std::size_t next = 0;
};

class Reader {
public:
  explicit Reader(std::string_view text) : lines(text) {}

  std::vector<Report> ReadAll() {
    std::vector<Report> reports;
    while (!lines.AtEnd()) {
      const std::size_t title = FindTitle();
      if (title == std::string_view::npos) {
        lines.Skip();
        continue;
      }
      reports.emplace_back();
      ReadReport(title, reports.back());
    }
    return reports;
  }

private:
  static std::string VersionStart() {
    return fmt::format("{}{}", headerIndent, PoolLabel::version);
  }

  /// The column at which a report starts in the present line. Behind other text of a program it
  /// does so only if its next line follows.
  std::size_t FindTitle() const {
    const std::size_t title = lines.Get().find(PoolTitle::pool);
    if (title == 0) return 0;
    if (title != std::string_view::npos && lines.GetSecond().starts_with(VersionStart()))
      return title;
    for (const char* const start : {PoolLabel::version, PoolTitle::buckets, PoolTitle::freeBuckets,
                                    PoolTitle::extRecs, BucketTitle::bucket})
      if (lines.StartsWith(fmt::format("{}{}", headerIndent, start)))
        lines.Fail(fmt::format("\"{}\" at a report's beginning in front of this", PoolTitle::pool));
    return std::string_view::npos;
  }

  /// A name may hold line ends, so it reaches to the next line of the block.
  void ReadName(std::size_t title, Report& report) {
    report.line = lines.GetNumber();
    report.name = lines.Get().substr(title + std::string_view(PoolTitle::pool).size());
    lines.Skip();
    const Lines behindTitle = lines;
    while (!lines.StartsWith(VersionStart())) {
      if (lines.AtEnd() || lines.StartsWith(PoolTitle::pool))
        behindTitle.Fail(fmt::format("\"{}\"", VersionStart()));
      report.name += fmt::format("\n{}", lines.Get());
      lines.Skip();
    }
    report.isCrLf = lines.Get().ends_with('\r');
    if (report.isCrLf) RemoveCr(report.name, behindTitle);
    lines.isCrLf = report.isCrLf;
  }

  static void RemoveCr(std::string& name, const Lines& behindTitle) {
    std::string result;
    name += '\n';
    for (std::size_t i = 0; i < name.size(); ++i) {
      if (name[i] == '\n' && (i == 0 || name[i - 1] != '\r'))
        behindTitle.Fail("a line end of CR and LF in front of this");
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
    const std::string mark = fmt::format("{}{}", titleIndent, BucketTitle::bucket);
    while (lines.Get().empty() && lines.GetSecond().starts_with(mark)) {
      report.bucketReports.emplace_back();
      ReadBucket(report.bucketReports.back());
    }
    CheckAllBuckets(report);
    lines.isCrLf = false;
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
    bucket.line = lines.GetNumber();
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

  /// A title behind an empty line; `second` is for a number behind the count.
  template <class Section>
  void ReadTitle(const std::string& start, Section& section, Number* second = nullptr) {
    lines.SkipExactly("");
    section.line = lines.GetNumber();
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

  /// A text, a count, a relation, a total; the text is whatever stands in front of the count.
  void ReadWarning(std::optional<Warning>& warning, std::string_view relation) {
    if (!lines.StartsWith(warningStart)) return;
    Fields fields(lines, "a warning");
    fields.TakeText(warningStart);
    warning.emplace();
    warning->source = fields.TakeNumber(warningWidth);
    fields.TakeText(": ");
    const std::string_view front = fields.GetRest().substr(0, fields.GetRest().rfind(relation));
    const std::size_t count = front.find_last_not_of("0123456789") + 1; // 0 if there is no other
    warning->text = fields.TakeFirst(count);
    warning->count = fields.TakeNumber();
    fields.TakeText(relation);
    warning->total = fields.TakeNumber();
    fields.TakeEnd();
    lines.Skip();
  }

  Lines lines;
};

} // namespace

std::vector<Report> ReadReports(std::string_view text) { return Reader(text).ReadAll(); }

} // namespace VOK::MemPool::Tools
