// Sizes against lifetimes: a cell for each pair of ranges, the darker the more blocks, by logarithm.
"use strict";

function drawBlocks() {
  if (data.blocks.length === 0) return;
  const sizes = [...new Set(data.blocks.map((block) => block.size))].sort((a, b) => b - a);
  const known = data.blocks.filter((block) => block.lifetime !== null).map((block) => block.lifetime);
  const lifetimes = [...new Set(known)].sort((a, b) => a - b);
  const columns = [...lifetimes, null]; // null: live at the end
  const most = Math.max(...data.blocks.map((block) => block.count));
  const all = data.blocks.reduce((sum, block) => sum + block.count, 0);
  const left = 130, top = 4, cell = { width: Math.min(70, Math.floor(930 / columns.length)), height: 24 };
  const width = left + columns.length * cell.width + 8, bottom = top + sizes.length * cell.height;
  const rangeOf = (log) => log === 0 ? "0" : log === 1 ? "1" : `${formatNumber(2 ** (log - 1))} to ${formatNumber(2 ** log - 1)}`;
  const countAt = (column, row) => data.blocks.find((block) =>
    block.size === sizes[row] && block.lifetime === columns[column])?.count ?? 0;
  const svg = make("svg", { viewBox: `0 0 ${width} ${bottom + 40}`, width, height: bottom + 40, tabindex: 0, role: "img",
    "aria-label": "Blocks by size and lifetime", keydown: onKey, style: `max-width: ${width}px` });
  const cells = new Map();
  for (const [row, size] of sizes.entries()) {
    svg.append(make("text", { x: left - 10, y: top + row * cell.height + 16, "text-anchor": "end" }, rangeOf(size)));
    for (const column of columns.keys()) {
      const count = countAt(column, row);
      const part = count === 0 ? 0.04 : 0.15 + 0.85 * Math.log1p(count) / Math.log1p(most);
      const place = make("rect", { class: "cell", x: left + column * cell.width + 1, y: top + row * cell.height + 1,
        width: cell.width - 2, height: cell.height - 2, style: `--part: ${part.toFixed(2)}`,
        pointermove: () => show(column, row), pointerdown: () => show(column, row) });
      cells.set(`${column} ${row}`, place);
      svg.append(place);
    }
  }
  svg.append(
    make("text", { x: left, y: bottom + 16 }, `freed after ${rangeOf(lifetimes[0] ?? 0)} requests`),
    make("text", { x: left + columns.length * cell.width, y: bottom + 32, "text-anchor": "end" }, "live at the end"));
  document.getElementById("blocks").append(
    make("h2", {}, "Sizes against lifetimes"),
    make("figure", {}, make("figcaption", { id: "block", "aria-live": "polite" }), make("div", { class: "scroll" }, svg)));

  let at = { column: 0, row: 0 };
  const largest = data.blocks.find((block) => block.count === most);
  show(columns.indexOf(largest.lifetime), sizes.indexOf(largest.size));

  function show(column, row) {
    cells.get(`${at.column} ${at.row}`).classList.remove("chosen");
    at = { column, row };
    cells.get(`${column} ${row}`).classList.add("chosen");
    const count = countAt(column, row);
    document.getElementById("block").replaceChildren(
      make("strong", {}, `${rangeOf(sizes[row])} bytes`),
      make("span", {}, columns[column] === null ? "live at the end" : `freed after ${rangeOf(columns[column])} requests`),
      make("span", {}, `${counted(count, "block")}, ${(100 * count / all).toFixed(1)}%`));
  }
  function onKey(event) {
    const move = { ArrowLeft: [-1, 0], ArrowRight: [1, 0], ArrowUp: [0, -1], ArrowDown: [0, 1],
      Home: [-columns.length, 0], End: [columns.length, 0] }[event.key];
    if (move === undefined) return;
    show(Math.min(Math.max(at.column + move[0], 0), columns.length - 1), Math.min(Math.max(at.row + move[1], 0), sizes.length - 1));
    event.preventDefault();
  }
}
