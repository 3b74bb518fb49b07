// What the pages with charts share: bytes, the lines of an axis, and hues.
"use strict";

const lightness = matchMedia("(prefers-color-scheme: dark)").matches ? 64 : 42;

/** The hue of a series: by the golden angle, so that neighbours differ. */
const hueOf = (i) => `hsl(${(205 + i * 137.5) % 360} 58% ${lightness}%)`;

function formatBytes(bytes) {
  const units = ["bytes", "KiB", "MiB", "GiB", "TiB"];
  let power = 0;
  while (bytes >= 1024 && power < units.length - 1) {
    bytes /= 1024;
    ++power;
  }
  return `${power === 0 ? formatNumber(bytes) : bytes.toFixed(bytes < 10 ? 1 : 0)} ${units[power]}`;
}

function formatBoth(bytes) {
  if (bytes === null) return "-";
  return bytes < 1024 ? formatBytes(bytes) : `${formatBytes(bytes)} (${formatNumber(bytes)})`;
}

/** A power of two that gives four lines at most. */
function stepOf(most) {
  let step = 1;
  while (most / step > 4) step *= 2;
  return step;
}

/** Lines across a chart of `width`, at multiples of bytes up to `most`. */
function gridOf(most, width, margin, scaleY) {
  const lines = [];
  for (let bytes = 0, step = stepOf(most); bytes <= most; bytes += step)
    lines.push(
      make("line", { class: "grid", x1: margin.left, x2: width - margin.right, y1: scaleY(bytes), y2: scaleY(bytes) }),
      make("text", { x: margin.left - 10, y: scaleY(bytes) + 4, "text-anchor": "end" }, formatBytes(bytes)));
  return lines;
}

/** The place under the pointer, of `last` + 1 along the chart. */
function placeUnder(event, last, margin) {
  const box = event.currentTarget.getBoundingClientRect();
  const width = event.currentTarget.viewBox.baseVal.width;
  const x = (event.clientX - box.left) / box.width * width;
  const share = (x - margin.left) / (width - margin.left - margin.right);
  return Math.min(Math.max(Math.round(share * last), 0), last);
}
