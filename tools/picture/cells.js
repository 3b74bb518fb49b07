// How a record looks. Each look differs in height or shape too, so that none needs its colour: a used
// record is tall, a free one low, what is served next has a mark below, what is damaged one above.
"use strict";

const cellMetrics = { above: 5, bar: 14, below: 6, low: 4, gap: 1, least: 3, side: 2 };
cellMetrics.line = cellMetrics.above + cellMetrics.bar + cellMetrics.below;

/** damaged, used, came, went or free; "used" is what stayed where two reports are compared. */
function lookOf(bucket, record) {
  const { type, damaged, before } = bucket.unpacked;
  if (damaged[record]) return "damaged";
  if (type[record] !== Type.used) return before[record] ? "went" : "free";
  if (bucket.change === "went") return "went";
  return isPair && !before[record] ? "came" : "used";
}

/** How many records of a bucket have each look; one that is served next counts as that alone. */
function countLooks(bucket) {
  const counts = { used: 0, free: 0, next: 0, damaged: 0, came: 0, went: 0 };
  for (let i = 0; i < bucket.count; ++i) {
    const look = lookOf(bucket, i);
    ++counts[look !== "damaged" && bucket.isHead(i) ? "next" : look];
  }
  return counts;
}

const palette = {};

function readPalette() {
  const style = getComputedStyle(document.documentElement);
  for (const name of ["paper", "ink", "used", "free", "next", "damaged", "came", "went"])
    palette[name] = style.getPropertyValue(`--${name}`).trim();
}

/** A triangle with its point at (x, y); a positive height has it point up. */
function paintMark(context, colour, x, y, height) {
  context.fillStyle = colour;
  context.beginPath();
  context.moveTo(x, y);
  context.lineTo(x - 4, y + height);
  context.lineTo(x + 4, y + height);
  context.fill();
}

/** Draws a record into a cell of `width` whose line begins at (x, y). */
function paintCell(context, look, isHead, x, y, width) {
  const { above, bar, below, low, gap } = cellMetrics;
  const ink = Math.max(1, width - gap);
  const top = y + above;
  const fill = (colour, from, height) => {
    context.fillStyle = palette[colour];
    context.fillRect(x, top + from, ink, height);
  };
  if (look === "used") fill("used", 0, bar);
  else if (look === "free") fill(isHead ? "next" : "free", bar - low, low);
  else if (look === "came") {
    fill("came", 0, bar);
    fill("paper", 4, 2);
  } else if (look === "went") {
    fill("went", 0, 2);
    fill(isHead ? "next" : "free", bar - low, low);
  } else {
    fill("damaged", 0, bar);
    fill("paper", bar / 2 - 3, 2);
    fill("paper", bar / 2 + 1, 2);
    paintMark(context, palette.damaged, x + ink / 2, top - 1, -4);
  }
  if (isHead) paintMark(context, palette.next, x + ink / 2, top + bar + 1, below - 1);
}

/** A frame around a cell: whole for the record that is shown, dashed for its next. */
function paintFrame(context, isDashed, x, y, width) {
  const { above, bar, gap } = cellMetrics;
  context.strokeStyle = palette.ink;
  context.lineWidth = 1.5;
  context.setLineDash(isDashed ? [2, 2] : []);
  context.strokeRect(x - 1.5, y + above - 1.5, Math.max(1, width - gap) + 3, bar + 3);
  context.setLineDash([]);
}

/** Sizes a canvas for the screen's pixels and empties it; gives its context in CSS pixels. */
function prepareCanvas(canvas, width, height) {
  const ratio = window.devicePixelRatio || 1;
  canvas.width = Math.round(width * ratio);
  canvas.height = Math.round(height * ratio);
  canvas.style.width = `${width}px`;
  canvas.style.height = `${height}px`;
  const context = canvas.getContext("2d");
  context.scale(ratio, ratio);
  return context;
}
