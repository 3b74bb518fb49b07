// What the replays took more than the heap: a row with its interval for each variant.
"use strict";

const signed = (seconds) => `${seconds < 0 ? "" : "+"}${(1e3 * seconds).toFixed(1)}`;
const formatInterval = (one) => `${signed(one.mean)} ms [${signed(one.low)}, ${signed(one.high)}]`;
const formatKiB = (bytes) => `${formatNumber(Math.floor(bytes / 1024))} KiB`;

/** The interval on a scale that all rows share. */
function barOf(one, range, isWide) {
  const scale = (seconds) => (seconds - range.low) / (range.high - range.low) * 1000;
  const hue = one.high < 0 ? "--gain" : one.low > 0 ? "--loss" : "--quiet";
  return make("svg", { viewBox: "0 0 1000 22", preserveAspectRatio: "none", "aria-hidden": "true",
    style: `--hue: var(${hue})` },
  make("line", { class: "zero", x1: scale(0), x2: scale(0), y1: 0, y2: 22, "vector-effect": "non-scaling-stroke" }),
  make("line", { class: isWide ? "interval wide" : "interval", x1: scale(one.low), x2: scale(one.high), y1: 11, y2: 11,
    "vector-effect": "non-scaling-stroke" }),
  make("line", { class: "interval", x1: scale(one.mean), x2: scale(one.mean), y1: 5, y2: 17,
    "vector-effect": "non-scaling-stroke" }));
}

function gainOf(name, seconds, difference, bytes, range, kind) {
  return make("li", { class: `gain ${kind}` },
    make("span", { class: "name" }, name),
    difference === null ? make("span", { class: "none" }) : barOf(difference, range, kind.includes("forecast")),
    make("span", { class: "number difference" },
      difference === null ? `${(1e3 * seconds.mean).toFixed(1)} ms` : formatInterval(difference)),
    make("span", { class: "number" }, bytes === null ? "" : formatKiB(bytes)));
}

function drawGains() {
  const replay = data.replay;
  if (replay === undefined) return;
  const all = [...replay.variants.map((one) => one.difference), replay.forecast ?? { low: 0, high: 0 }];
  const range = { low: Math.min(...all.map((one) => one.low)), high: Math.max(...all.map((one) => one.high)) };
  const rows = replay.variants.map((one) => gainOf(one.name, one.seconds,
    one.name === "heap" ? null : one.difference, one.bytes, range,
    replay.best !== undefined && one.name === replay.best.name ? "best" : ""));
  if (replay.best !== undefined)
    rows.push(
      gainOf(`${replay.best.name}, again`, replay.best.seconds, replay.best.difference, replay.best.bytes, range, "apart"),
      gainOf("expected in the program", null, replay.forecast, null, range, "forecast"));
  const what = replay.whole ? "the whole recording"
    : `events ${formatNumber(replay.first)} to ${formatNumber(replay.last)}`;
  document.getElementById("gains").append(
    make("h2", {}, "More than the heap"),
    make("p", { class: "quiet" }, `Replayed: ${what}, ${replay.rounds} rounds in one thread, each in a process ` +
      "of its own. Time with intervals of 95%, and the heap at the peak."),
    make("ol", {}, ...rows));
}

function drawChange() {
  if (data.replay === undefined || !data.replay.pays) return;
  document.getElementById("change").append(
    make("h2", {}, "What to change"), make("pre", {}, data.replay.changes.join("\n")),
    make("p", { class: "quiet" }, "Settings, or as keys of the environment:"),
    make("pre", {}, `${data.replay.best.options}\n${data.replay.best.keys}`));
}
