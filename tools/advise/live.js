// Live bytes over the events, by call site: areas on top of each other, the largest peak at the bottom.
"use strict";

const mostStacked = 8;
const margin = { left: 76, right: 12, top: 8, bottom: 28 };
const height = 320;
const lastSample = data.samples.length - 1;

/** The sites that have an area, and one for all others. Each has its bytes by sample. */
function makeSeries() {
  const bytesOf = (i) => data.samples.map((sample) => sample.bytes[i]);
  const order = [...data.sites.keys()].sort((a, b) => data.sites[b].peakBytes - data.sites[a].peakBytes);
  const stacked = order.slice(0, mostStacked).filter((i) => data.sites[i].peakBytes > 0);
  const series = stacked.map((i) => ({ name: data.sites[i].where, hue: data.sites[i].hue, bytes: bytesOf(i) }));
  const others = data.samples.map((sample, at) =>
    sample.bytes.reduce((sum, bytes) => sum + bytes, 0) - series.reduce((sum, one) => sum + one.bytes[at], 0));
  if (others.some((bytes) => bytes > 0)) series.push({ name: "other call sites", hue: "var(--quiet)", bytes: others });
  return series;
}

let series, sums;
let place = 0; // of the cursor

function drawLive() {
  if (lastSample < 1) return;
  series = makeSeries();
  sums = data.samples.map((_, at) => series.reduce((sum, one) => sum + one.bytes[at], 0));
  place = sums.indexOf(Math.max(...sums));
  document.getElementById("live").append(
    make("h2", {}, "Live bytes by call site"),
    make("figure", {}, make("figcaption", { id: "caption", "aria-live": "polite" }), make("div", { id: "chart" })));
  drawAreas();
  addEventListener("resize", drawAreas);
}

function drawAreas() {
  const chart = document.getElementById("chart");
  const width = Math.max(chart.clientWidth, 280);
  const most = Math.max(1, ...sums);
  const events = data.samples[lastSample].event;
  const scaleX = (at) => margin.left + data.samples[at].event / events * (width - margin.left - margin.right);
  const scaleY = (bytes) => height - margin.bottom - bytes / most * (height - margin.top - margin.bottom);
  const svg = make("svg", {
    viewBox: `0 0 ${width} ${height}`, height, tabindex: 0, role: "img", "aria-label": "Live bytes over the events",
    keydown: onKey, pointermove: onPointer, pointerdown: onPointer,
  });
  const areas = make("g", { class: "stack" });
  let below = data.samples.map(() => 0);
  for (const one of series) {
    const above = below.map((bytes, at) => bytes + one.bytes[at]);
    const points = [...above.map((bytes, at) => [at, bytes]), ...below.map((bytes, at) => [at, bytes]).reverse()];
    areas.append(make("path", { style: `--hue: ${one.hue}`,
      d: `M${points.map(([at, bytes]) => `${scaleX(at).toFixed(1)} ${scaleY(bytes).toFixed(1)}`).join("L")}Z` }));
    below = above;
  }
  svg.append(...gridOf(most, width, margin, scaleY), areas,
    make("text", { x: margin.left, y: height - 6 }, "event 0"),
    make("text", { x: width - margin.right, y: height - 6, "text-anchor": "end" }, formatNumber(events)),
    make("line", { class: "cursor", id: "cursor", y1: margin.top, y2: height - margin.bottom }));
  chart.replaceChildren(svg);
  showPlace();

  function showPlace() {
    for (const end of ["x1", "x2"]) document.getElementById("cursor").setAttribute(end, scaleX(place));
    document.getElementById("caption").replaceChildren(
      make("strong", {}, `after event ${formatNumber(data.samples[place].event)}`),
      make("span", {}, formatBoth(sums[place])),
      make("span", { class: "legend" }, ...series.map((one) => make("span", {},
        make("span", { class: "dot", style: `--hue: ${one.hue}` }), one.name, make("b", {}, formatBytes(one.bytes[place]))))));
  }
  function onPointer(event) {
    const under = placeUnder(event, events, margin);
    place = data.samples.findLastIndex((sample) => sample.event <= under);
    showPlace();
  }
  function onKey(event) {
    const moves = { ArrowLeft: place - 1, ArrowRight: place + 1, Home: 0, End: lastSample };
    if (!(event.key in moves)) return;
    place = Math.min(Math.max(moves[event.key], 0), lastSample);
    showPlace();
    event.preventDefault();
  }
}
