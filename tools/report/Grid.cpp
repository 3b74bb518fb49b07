#include "report/Grid.h"

#include "report/FixedLines.h"

#include <algorithm>
#include <fmt/format.h>
#include <span>

namespace VOK::MemPool::Tools {

namespace {

/// Skips a line that is made of so and so many equal pieces, and returns how many.
std::size_t TakePieces(Lines& lines, std::string (*form)(std::size_t)) {
  constexpr std::size_t margin = 6;
  constexpr std::size_t piece = 10;
  lines.CheckWhole("a line of the record map");
  const std::size_t size = std::max(lines.Get().size(), margin);
  const std::size_t count = std::min((size - margin) / piece, Map::boxesPerRow);
  lines.SkipExactly(form(count));
  return count;
}

/// Takes a value of each box in the rest of the line.
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

} // namespace

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

} // namespace VOK::MemPool::Tools
