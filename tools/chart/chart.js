// Draws the pools over time: a line for the bytes held and a dotted one for the payload of each, and a
// table of the pools. `lines` has the line of each place in the text. Each point of a pool is [place,
// bytes held or null, payload]; the pool is there from its first point to its last.
"use strict";

const pools = data.pools;
const lastPlace = data.lines.length - 1;
const hasHeld = pools.some((pool) => pool.points[0][1] !== null); // a trace has no buckets
const measure = hasHeld ? 1 : 2; // what the peak and the growth are of
const payloadWord = hasHeld ? "payload" : "live bytes";
const margin = { left: 76, right: 12, top: 8, bottom: 28 };
const height = 360;

let place = lastPlace; // of the cursor
let picked = null;

/** Null where the pool isn't there. */
function pointAt(pool, at) {
  if (at > pool.points.at(-1)[0]) return null;
  return pool.points.findLast((point) => point[0] <= at) ?? null;
}

function totalAt(at) {
  const points = pools.map((pool) => pointAt(pool, at)).filter((point) => point !== null);
  return [1, 2].map((i) => points.reduce((sum, point) => sum + point[i], 0));
}

function makeHead() {
  document.title = `Pools of ${data.source} over time`;
  document.getElementById("head").append(
    make("p", { class: "kicker" }, "libVokMemPool"),
    make("h1", {}, data.source),
    make("p", { class: "lead" }, `${counted(pools.length, "pool")} at ${counted(data.lines.length, "place")} in the text.`));
}

const figure = document.getElementById("figure");
let scaleX, scaleY;

/** A line, or a dot for a pool that is there once. */
function shapeOf(pool, index) {
  const places = pool.points.map((point) => `${scaleX(point[0])} ${scaleY(point[index])}`);
  if (places.length > 1)
    return make("path", { class: index === measure ? "full" : "dots", d: `M${places.join("L")}` });
  const [x, y] = places[0].split(" ");
  return make("circle", { cx: x, cy: y, r: 3 });
}

function drawChart() {
  const width = Math.max(figure.clientWidth, 280);
  const shown = picked === null ? pools : [picked];
  const most = Math.max(1, ...shown.flatMap((pool) => pool.points.map((point) => Math.max(point[1], point[2]))));
  scaleX = (at) => margin.left + at / Math.max(lastPlace, 1) * (width - margin.left - margin.right);
  scaleY = (bytes) => height - margin.bottom - bytes / most * (height - margin.top - margin.bottom);
  const svg = make("svg", {
    viewBox: `0 0 ${width} ${height}`, height, tabindex: 0, role: "img",
    "aria-label": "Bytes over the lines of the text", keydown: onKey,
    pointermove: onPointer, pointerdown: onPointer,
  });
  svg.append(
    ...gridOf(most, width, margin, scaleY),
    make("text", { x: margin.left, y: height - 6 }, `line ${formatNumber(data.lines[0])}`),
    make("text", { x: width - margin.right, y: height - 6, "text-anchor": "end" }, formatNumber(data.lines[lastPlace])));
  for (const pool of shown)
    svg.append(make("g", { class: "pool", style: `--hue: ${pool.hue}` },
      ...(hasHeld ? [shapeOf(pool, 1)] : []), shapeOf(pool, 2)));
  svg.append(make("line", { class: "cursor", id: "cursor", y1: margin.top, y2: height - margin.bottom }));
  const hadFocus = document.activeElement !== null && document.activeElement.tagName === "svg";
  figure.replaceChildren(make("figcaption", { id: "caption" }), svg);
  if (hadFocus) svg.focus();
  showPlace();
}

/** Puts the cursor at its place and shows the values there. */
function showPlace() {
  const [held, payload] = picked === null ? totalAt(place)
    : (pointAt(picked, place) ?? [place, null, null]).slice(1);
  const name = picked !== null ? picked.name : pools.length === 1 ? pools[0].name : "all pools";
  const line = `line ${formatNumber(data.lines[place])}`;
  const values = hasHeld ? [["bytes held", held, "full"], ["payload", payload, "dots"]]
    : [["live bytes", payload, "full"]];
  document.getElementById("caption").replaceChildren(
    make("strong", {}, name), make("span", {}, line), ...values.map(([word, bytes, key]) =>
      make("span", {}, make("span", { class: `key ${key}` }), `${word} ${formatBoth(bytes)}`)));
  const cursor = document.getElementById("cursor");
  for (const end of ["x1", "x2"]) cursor.setAttribute(end, scaleX(place));
  document.getElementById("spoken").textContent =
    [name, line, ...values.map(([word, bytes]) => `${word} ${formatBoth(bytes)}`)].join(", ");
  showTable();
}

function onPointer(event) {
  place = placeUnder(event, lastPlace, margin);
  showPlace();
}

function onKey(event) {
  const moves = {
    ArrowLeft: Math.max(place - 1, 0), ArrowRight: Math.min(place + 1, lastPlace), Home: 0, End: lastPlace,
  };
  const at = pools.indexOf(picked);
  if (event.key in moves) {
    place = moves[event.key];
    showPlace();
  } else if (event.key === "ArrowDown") pick(pools[Math.min(at + 1, pools.length - 1)]);
  else if (event.key === "ArrowUp") pick(at <= 0 ? null : pools[at - 1]);
  else if (event.key === "Escape") pick(null);
  else return;
  event.preventDefault();
}

function pick(pool) {
  picked = pool;
  drawChart();
}

function showTable() {
  const cells = (held, payload, peak, growth) => [...(hasHeld ? [held] : []), payload, peak, growth]
    .map((value) => make("td", {}, value === null ? "-" : formatNumber(value)));
  const rows = pools.map((pool) => {
    const point = pointAt(pool, place) ?? [0, null, null];
    return make("tr", { style: `--hue: ${pool.hue}` },
      make("td", {}, make("button", {
        type: "button", title: pool.name, "aria-pressed": String(pool === picked),
        click: () => pick(pool === picked ? null : pool),
      }, pool.name)), ...cells(point[1], point[2], pool.peak, pool.growth));
  });
  const total = totalAt(place);
  const grown = totalAt(lastPlace)[measure - 1] - totalAt(0)[measure - 1];
  const columns = ["pool", ...(hasHeld ? ["bytes held"] : []), payloadWord, "peak", "growth"];
  const focused = [...document.querySelectorAll("tbody button")].indexOf(document.activeElement);
  document.getElementById("pools").replaceChildren(make("table", {},
    make("thead", {}, make("tr", {}, ...columns.map((text) => make("th", { scope: "col" }, text)))),
    make("tbody", {}, ...rows),
    make("tfoot", {}, make("tr", {}, make("td", {}, "total"), ...cells(total[0], total[1], null, grown)))));
  if (focused >= 0) document.querySelectorAll("tbody button")[focused].focus();
}

for (const pool of pools) {
  pool.peak = Math.max(...pool.points.map((point) => point[measure]));
  pool.growth = pool.points.at(-1)[measure] - pool.points[0][measure];
}
pools.sort((a, b) => b.peak - a.peak);
for (const [i, pool] of pools.entries())
  pool.hue = hueOf(i);
makeHead();
drawChart();
addEventListener("resize", drawChart);
