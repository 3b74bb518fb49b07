#include "report/Summary.h"

#include "common/Files.h"

#include <algorithm>
#include <fmt/format.h>

namespace VOK::MemPool::Tools {

Bytes BytesOf(const Report& report) {
  // Five pointers and 8 bytes are the header of a bucket, two pointers and 8 bytes that of an ext
  // record.
  const std::uint64_t pointer = (std::max<Number>(report.sizeofBucket, 8) - 8) / 5;
  Bytes bytes;
  for (const BucketRow& row : report.buckets.rows) {
    bytes.held += report.sizeofBucket + std::uint64_t{row.total} * row.recSize;
    if (row.recSize > report.sizeofHeader)
      bytes.payload += std::uint64_t{row.used} * (row.recSize - report.sizeofHeader);
  }
  for (const ExtRow& row : report.extRecs.rows) {
    bytes.held += 2 * pointer + 8 + row.length;
    bytes.payload += row.length;
  }
  return bytes;
}

std::string Summarise(const std::vector<Report>& reports, const std::vector<std::string>& marks) {
  constexpr auto form = "{:<{}} {:>10} {:>10} {:>10} {:>13} {:>13} {:>8}{}\n";
  std::size_t width = 4;
  for (const Report& report : reports)
    width = std::max(width, OneLine(report.name).size());
  std::string text =
      fmt::format(form, "pool", width, "used", "free", "ext", "bytes held", "payload", "share", "");
  for (std::size_t i = 0; i < reports.size(); ++i) {
    const Report& report = reports[i];
    const Bytes bytes = BytesOf(report);
    const std::string share =
        bytes.held == 0 ? "-"
                        : fmt::format("{:.1f} %", static_cast<double>(bytes.payload) * 100.0 /
                                                      static_cast<double>(bytes.held));
    text += fmt::format(form, OneLine(report.name), width, report.usedRecs, report.freeRecs,
                        report.numExtRecs, bytes.held, bytes.payload, share,
                        (report.IsOff() ? " off" : "") + (marks.empty() ? "" : marks[i]));
  }
  return text;
}

} // namespace VOK::MemPool::Tools
