// Elements, numbers, bars, and tables that sort.
"use strict";

const formatPercent = (percent) => `${percent.toFixed(1)} %`;

/** The largest of what a key gives for some items, and at least 1. */
const largest = (items, keyOf) => items.reduce((most, item) => Math.max(most, keyOf(item)), 1);

/** A bar of `share` from 0 to 1. */
function makeBar(share, kind = "") {
  const fill = share > 0 ? make("span") : null;
  if (fill !== null) fill.style.width = `${Math.min(1, share) * 100}%`;
  return make("span", { class: `bar ${kind}`, "aria-hidden": "true" }, fill);
}

/** Signed and in the colour of its kind, nothing for 0. */
function makeChange(number, kind) {
  if (number === 0) return make("span", { class: "quiet" }, "·");
  return make("span", { class: kind }, (kind === "came" ? "+" : "−") + formatNumber(number));
}

const makeDifference = (now, before) => makeChange(Math.abs(now - before), now > before ? "came" : "went");

/** Sorts by a key; texts, numbers and hexadecimal texts of one width compare as they should. */
function compareBy(keyOf, isDescending) {
  const sign = isDescending ? -1 : 1;
  return (a, b) => {
    const x = keyOf(a), y = keyOf(b);
    return x < y ? -sign : x > y ? sign : 0;
  };
}

/** A heading that sorts by its column when it is pressed. `sort` is what the table is sorted by. */
function makeSortHeading(name, column, sort, press) {
  if (column.key === undefined) return make(name, { class: "quiet", scope: "col" }, column.title);
  const isSorted = sort.column === column;
  const arrow = isSorted ? (sort.isDescending ? "↓" : "↑") : "";
  const attributes = {
    class: column.kind ?? null,
    "aria-sort": isSorted ? (sort.isDescending ? "descending" : "ascending") : "none",
    ...(name === "th" ? { scope: "col" } : { role: "columnheader" }),
  };
  const button = make("button", { type: "button", title: column.about ?? null, click: () => press(column) },
    make("span", {}, column.title), make("span", { class: "arrow", "aria-hidden": "true" }, arrow));
  return make(name, attributes, button);
}

/** The sort after a press on a column: numbers begin with the largest, a second press turns it. */
function pressed(sort, column) {
  const isAgain = sort.column === column;
  return { column, isDescending: isAgain ? !sort.isDescending : column.kind === "number" };
}

/**
 * A table of rows. A column has `title`, `kind` ("number" or none), `key` of a row to sort by (none:
 * it doesn't sort), `show` for what a cell holds, and `total` of all rows for the last row. A long
 * table shows its first rows in the order chosen, and their number.
 */
function makeTable(label, columns, rows, { most = 500, rowAttributes = () => ({}) } = {}) {
  const table = make("table", { "aria-label": label });
  let sort = { column: null, isDescending: false };
  const fill = () => {
    const focused = [...table.querySelectorAll("th button")].indexOf(document.activeElement);
    const sorted = sort.column === null ? rows : [...rows].sort(compareBy(sort.column.key, sort.isDescending));
    const press = (column) => {
      sort = pressed(sort, column);
      fill();
    };
    const body = sorted.slice(0, most).map((row) =>
      make("tr", rowAttributes(row), ...columns.map((column) =>
        make("td", { class: column.kind ?? null }, column.show(row)))));
    table.replaceChildren(
      make("thead", {}, make("tr", {}, ...columns.map((column) => makeSortHeading("th", column, sort, press)))),
      make("tbody", {}, ...body));
    const foot = make("tfoot");
    if (rows.length > most)
      foot.append(make("tr", {}, make("td", { class: "quiet", colspan: columns.length },
        `the first ${formatNumber(most)} of ${formatNumber(rows.length)} rows`)));
    if (rows.length > 1 && columns.some((column) => column.total !== undefined))
      foot.append(make("tr", { class: "total" }, ...columns.map((column, i) =>
        make("td", { class: column.kind ?? null }, i === 0 ? "Total" : column.total?.(rows) ?? ""))));
    table.append(foot);
    if (focused >= 0) table.querySelectorAll("th button")[focused].focus();
  };
  fill();
  return make("div", { class: "scroll" }, table);
}

/** A column of numbers under a key of the rows; what went counts in no total. */
const numberColumn = (title, key, about) => ({
  title, about, kind: "number", key: (row) => row[key], show: (row) => formatNumber(row[key]),
  total: (rows) => formatNumber(sumOf(rows.filter((row) => row.change !== "went"), key)),
});

/** A column of how much of `whole` is `part`. */
const shareColumn = (about, part, whole) => {
  const share = (items) => [sumOf(items, part), sumOf(items, whole)];
  const show = ([ofPart, ofWhole]) => (ofWhole === 0 ? "–" : formatPercent((ofPart * 100) / ofWhole));
  return {
    title: "Share", kind: "number", about, key: (row) => row[part] / Math.max(1, row[whole]),
    show: (row) => show(share([row])),
    total: (rows) => show(share(rows.filter((row) => row.change !== "went"))),
  };
};

/** The two columns of what changed, none where a single report is shown. */
const changeColumns = () => (!isPair ? [] : ["came", "went"].map((kind) => ({
  title: kind === "came" ? "Came" : "Went",
  kind: "number", key: (row) => row[kind], show: (row) => makeChange(row[kind], kind),
  total: (rows) => makeChange(sumOf(rows, kind), kind),
})));
