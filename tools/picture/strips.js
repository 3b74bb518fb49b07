// The buckets of a pool, each a row with a strip of its records. Of thousands of rows only those in
// view are elements; their strips are canvases, drawn when they come into view.
"use strict";

const rowMetrics = { heading: 40, pad: 3, text: 22, narrow: 720, over: 400 };

/** What the page says of a record: at the pointer, at the cursor, and aloud. */
const tip = {
  element: document.getElementById("tip"),
  spoken: document.getElementById("spoken"),

  /** Shows a record beside its cell; `box` is the cell's place in the window. */
  show(bucket, record, box) {
    this.element.replaceChildren(...describe(bucket, record));
    this.element.hidden = false;
    const { offsetWidth: width, offsetHeight: height } = this.element;
    const left = Math.min(box.left + box.width / 2 - width / 2, document.documentElement.clientWidth - width - 8);
    const isBelow = box.bottom + height + 12 < window.innerHeight;
    this.element.style.left = `${Math.max(8, left)}px`;
    this.element.style.top = `${isBelow ? box.bottom + 8 : box.top - height - 8}px`;
  },

  hide() {
    this.element.hidden = true;
  },

  speak(bucket, record) {
    const parts = describe(bucket, record).flatMap((part) =>
      part.tagName === "DL" ? [...part.children].map((pair) => [...pair.children].map((e) => e.textContent).join(" "))
        : [part.textContent]);
    this.spoken.textContent = `Bucket ${bucket.id}: ${parts.join(", ")}`;
  },
};

function titleOf(bucket, record) {
  const type = bucket.unpacked.type[record];
  const was = bucket.unpacked.before[record] === 1;
  if (lookOf(bucket, record) === "damaged") return "Damaged";
  if (bucket.change === "went") return type === Type.used ? "Went with its bucket" : "Free, its bucket went";
  if (type === Type.used) return !isPair ? "In use" : was ? "In use, as before" : "Came into use";
  const served = bucket.isHead(record) ? ", served next" : "";
  return `${isPair && was ? "Freed" : "Free"}${served}`;
}

/** The elements that describe a record. */
function describe(bucket, record) {
  const { type, next } = bucket.unpacked;
  const offset = bucket.offsetOf(record);
  const fact = (name, value) => make("div", {}, make("dt", {}, name), make("dd", {}, value));
  const facts = [
    fact("type", typeNames[type[record]]),
    fact("offset", `${offset} to ${offset + bucket.recSize}`),
    fact(type[record] === Type.free ? "room" : "data", counted(bucket.dataSize, "byte")),
  ];
  if (type[record] === Type.free) {
    const at = bucket.recordAt(next[record]);
    const place = next[record] === 0 ? "none, the list ends" : at < 0 ? `${next[record]}, no record` :
      `${next[record]} (record ${at + 1})`;
    facts.push(fact("next", place));
  }
  facts.push(fact("address", bucket.addressOf(record)));
  return [
    make("strong", {}, titleOf(bucket, record)),
    make("span", { class: "quiet" }, `record ${record + 1} of ${bucket.count}`),
    make("dl", {}, ...facts),
    ...bucket.faultsOf(record).map((fault) => make("p", { class: "fault" }, `line ${fault.line}: ${fault.text}`)),
  ];
}

const bucketColumns = [
  { title: "Id", kind: "number", key: (b) => b.id, show: (b) => `${b.id}` },
  { title: "Data", kind: "number", about: "bytes of data in a record", key: (b) => b.dataSize,
    show: (b) => formatNumber(b.dataSize) },
  { title: "Used", kind: "number", key: (b) => b.used, show: (b) => formatNumber(b.used) },
  { title: "Free", kind: "number", key: (b) => b.free, show: (b) => formatNumber(b.free) },
  { title: "Share", kind: "number", about: "records in use", key: (b) => b.percent,
    show: (b) => formatPercent(b.percent) },
  { title: "Address", key: (b) => b.addr.padStart(16, "0"), show: (b) => `0x${b.addr}` },
];

class BucketList {
  constructor(pool) {
    this.pool = pool;
    this.sizeClass = null; // the one that is shown alone
    this.sort = { column: bucketColumns[0], isDescending: false };
    this.rows = new Map(); // by place in this.items
    this.cursor = null; // the record at the keyboard's focus, as this.pointed is that at the pointer
    this.pointed = null;
    this.head = make("div", { class: "row head", role: "row" });
    this.body = make("div", {
      class: "strips", tabindex: 0, role: "application", "aria-describedby": "keys",
      "aria-label": `Records of ${pool.label}`,
      keydown: (event) => this.press(event),
      focus: () => this.enter(),
      blur: () => this.leave(),
      pointermove: (event) => this.point(event),
      pointerleave: () => this.unpoint(),
      click: (event) => this.tap(event),
    });
    this.element = make("div", { class: "list" }, this.head, this.body);
    this.arrange();
  }

  /** Shows one size class alone, or all of them for null. */
  filter(sizeClass) {
    this.sizeClass = sizeClass;
    this.arrange();
    this.layOut();
  }

  /** Brings the buckets into their order; in that of the report each size class has a heading. */
  arrange() {
    const { column, isDescending } = this.sort;
    const buckets = this.pool.buckets.filter((b) => this.sizeClass === null || b.sizeClass === this.sizeClass);
    const byReport = column === bucketColumns[0] && !isDescending;
    const places = new Map(this.pool.classes.map((sizeClass, i) => [sizeClass, i]));
    buckets.sort(compareBy(column.key, isDescending));
    if (byReport) buckets.sort(compareBy((b) => places.get(b.sizeClass), false));
    this.items = [];
    for (const bucket of buckets) {
      if (byReport && this.items.at(-1)?.bucket.sizeClass !== bucket.sizeClass)
        this.items.push({ bucket, isHeading: true });
      this.items.push({ bucket, isHeading: false });
    }
    const press = (pressedColumn) => {
      this.sort = pressed(this.sort, pressedColumn);
      this.arrange();
      this.layOut();
      this.head.querySelectorAll("button")[bucketColumns.indexOf(pressedColumn)].focus();
    };
    this.head.replaceChildren(
      ...bucketColumns.map((c) => makeSortHeading("span", c, this.sort, press)),
      make("span", { class: "wide" }, "Records by address"));
  }

  /** Works out where each row begins, for the width at hand. */
  layOut() {
    this.width = this.body.clientWidth;
    this.isNarrow = this.width < rowMetrics.narrow;
    const columns = this.head.querySelector(".wide");
    this.strip = Math.max(60, this.isNarrow ? this.width : columns.clientWidth);
    this.tops = [];
    let top = 0;
    for (const item of this.items) {
      this.tops.push(top);
      top += item.isHeading ? rowMetrics.heading : this.heightOf(item.bucket);
    }
    this.body.style.height = `${top}px`;
    this.height = top;
    this.clear();
    this.render();
  }

  heightOf(bucket) {
    const { perLine } = this.gridOf(bucket);
    const lines = Math.max(1, Math.ceil(bucket.count / perLine));
    return lines * cellMetrics.line + 2 * rowMetrics.pad + (this.isNarrow ? rowMetrics.text : 0);
  }

  /** The width of a bucket's cells and their number in a line. Cells of a pool are to scale, in whole
      pixels where a fraction would show. */
  gridOf(bucket) {
    const scaled = (this.strip * bucket.recSize) / this.pool.area;
    const width = Math.min(this.strip, scaled < 12 ? Math.max(cellMetrics.least, Math.floor(scaled)) : scaled);
    return { width, perLine: Math.max(1, Math.floor((this.strip + 0.01) / width)) };
  }

  clear() {
    this.rows.clear();
    this.body.replaceChildren();
  }

  /** Makes the rows that have come into view, and drops those that have gone. */
  render() {
    const box = this.body.getBoundingClientRect();
    const from = -rowMetrics.over - box.top;
    const to = window.innerHeight + rowMetrics.over - box.top;
    const first = this.itemAt(from);
    for (const [i, row] of this.rows)
      if (i < first || this.tops[i] >= to) {
        row.remove();
        this.rows.delete(i);
      }
    for (let i = first; i < this.items.length && this.tops[i] < to; ++i) {
      if (this.rows.has(i)) continue;
      const row = this.makeRow(this.items[i]);
      row.style.top = `${this.tops[i]}px`;
      this.rows.set(i, row);
      this.body.append(row);
    }
  }

  /** The last item that begins at or above a height. */
  itemAt(height) {
    let low = 0, high = this.tops.length;
    while (low < high) {
      const middle = (low + high) >> 1;
      if (this.tops[middle] <= height) low = middle + 1;
      else high = middle;
    }
    return Math.max(0, low - 1);
  }

  makeRow({ bucket, isHeading }) {
    if (isHeading) {
      const { dataSize, buckets, used, free } = bucket.sizeClass;
      return make("div", { class: "row class" }, make("strong", {}, counted(dataSize, "byte")),
        make("span", { class: "quiet" }, `${counted(buckets, "bucket")}, ${formatNumber(used)} of ` +
          `${counted(used + free, "record")} in use`));
    }
    const canvas = make("canvas");
    const row = make("div", { class: `row ${bucket.change}` },
      ...bucketColumns.map((column) => make("span", { class: column.kind ?? null }, column.show(bucket))), canvas);
    if (bucket.change !== "")
      row.children[0].prepend(make("span", { class: `${bucket.change} sign` }, bucket.change === "came" ? "+ " : "− "));
    row.bucket = bucket;
    this.paint(row);
    return row;
  }

  paint(row) {
    const { bucket } = row;
    const { width, perLine } = this.gridOf(bucket);
    const lines = Math.max(1, Math.ceil(bucket.count / perLine));
    const { side } = cellMetrics; // room for a frame around the outer cells
    const context = prepareCanvas(row.querySelector("canvas"), this.strip + 2 * side, lines * cellMetrics.line);
    context.translate(side, 0);
    const place = (record) => [(record % perLine) * width, Math.floor(record / perLine) * cellMetrics.line, width];
    for (let i = 0; i < bucket.count; ++i)
      paintCell(context, lookOf(bucket, i), bucket.isHead(i), ...place(i));
    for (const marked of [this.pointed, this.cursor]) {
      if (marked?.bucket !== bucket) continue;
      const next = bucket.recordAt(bucket.unpacked.next[marked.record]);
      if (next >= 0) paintFrame(context, true, ...place(next));
      paintFrame(context, false, ...place(marked.record));
    }
  }

  repaint(bucket) {
    for (const row of this.rows.values()) if (row.bucket === bucket) this.paint(row);
  }

  /** The place of a record's cell in the window. */
  boxOf({ bucket, record }) {
    const row = [...this.rows.values()].find((r) => r.bucket === bucket);
    if (row === undefined) return null;
    const { width, perLine } = this.gridOf(bucket);
    const box = row.querySelector("canvas").getBoundingClientRect();
    const left = box.left + cellMetrics.side + (record % perLine) * width;
    const top = box.top + Math.floor(record / perLine) * cellMetrics.line;
    return { left, width, top, bottom: top + cellMetrics.line };
  }

  /** The record under the pointer, null for none. */
  under(event) {
    const bucket = event.target.tagName === "CANVAS" ? event.target.closest(".row").bucket : null;
    if (bucket === null) return null;
    const { width, perLine } = this.gridOf(bucket);
    const column = Math.floor((event.offsetX - cellMetrics.side) / width);
    const record = Math.floor(event.offsetY / cellMetrics.line) * perLine + column;
    return column >= 0 && column < perLine && record >= 0 && record < bucket.count ? { bucket, record } : null;
  }

  /** Moves one of the two marks, and shows the record at the last one. */
  mark(which, place) {
    const old = this[which];
    if (old?.bucket === place?.bucket && old?.record === place?.record) return;
    this[which] = place;
    if (old !== null && old.bucket !== place?.bucket) this.repaint(old.bucket);
    if (place !== null) this.repaint(place.bucket);
    this.showTip();
  }

  showTip() {
    const shown = this.pointed ?? (document.activeElement === this.body ? this.cursor : null);
    const box = shown === null ? null : this.boxOf(shown);
    if (box === null) tip.hide();
    else tip.show(shown.bucket, shown.record, box);
  }

  point(event) {
    // The page also moves below a pointer that doesn't move.
    const isMoved = event.movementX !== 0 || event.movementY !== 0;
    if (isMoved && event.pointerType !== "touch") this.mark("pointed", this.under(event));
  }

  unpoint() {
    this.mark("pointed", null);
  }

  tap(event) {
    this.body.focus({ preventScroll: true });
    this.mark("cursor", this.under(event));
  }

  enter() {
    if (!this.body.matches(":focus-visible")) return;
    const start = this.cursor ?? this.firstInView();
    if (start !== null) this.go(start.bucket, start.record);
  }

  /** Where the cursor begins. */
  firstInView() {
    const top = this.head.getBoundingClientRect().bottom - this.body.getBoundingClientRect().top;
    const item = this.items.find(({ isHeading }, i) => !isHeading && this.tops[i] >= top);
    return item === undefined ? null : { bucket: item.bucket, record: 0 };
  }

  leave() {
    const old = this.cursor;
    this.cursor = null;
    if (old !== null) this.repaint(old.bucket);
    tip.hide();
  }

  /** Puts the cursor on a record and brings it into view. */
  go(bucket, record) {
    const i = this.items.findIndex((item) => !item.isHeading && item.bucket === bucket);
    const box = this.body.getBoundingClientRect();
    const top = box.top + this.tops[i], bottom = top + this.heightOf(bucket);
    const margin = 120; // for what sticks to the window's top, and for the tip
    if (top < margin || bottom > window.innerHeight - margin)
      window.scrollBy({ top: top - window.innerHeight / 2, behavior: "instant" });
    this.render();
    this.mark("cursor", { bucket, record });
    tip.speak(bucket, record);
  }

  press(event) {
    if (event.ctrlKey || event.altKey || event.metaKey || event.target !== this.body) return;
    if (event.key === "Escape") return this.mark("cursor", null);
    const start = this.cursor ?? this.firstInView();
    const target = start === null ? null : this.targetOf(event.key, start);
    if (target === null) return;
    event.preventDefault();
    this.unpoint();
    this.go(target.bucket, target.record);
  }

  /** The record that a key leads to from a place, null if it leads to none. */
  targetOf(key, { bucket, record }) {
    const stay = { bucket, record };
    const within = (to) => ({ bucket, record: Math.min(Math.max(to, 0), bucket.count - 1) });
    switch (key) {
      case "ArrowLeft": return within(record - 1);
      case "ArrowRight": return within(record + 1);
      case "Home": return within(0);
      case "End": return within(bucket.count - 1);
      case "ArrowUp": return this.beside(stay, -1);
      case "ArrowDown": return this.beside(stay, 1);
      case "PageUp": return this.beside(stay, -10);
      case "PageDown": return this.beside(stay, 10);
      case "n": return this.orStay(stay, bucket.recordAt(bucket.unpacked.next[record]));
      case "h": return this.orStay(stay, bucket.recordAt(bucket.head));
      case "d": return this.damagedAfter(stay);
      default: return null;
    }
  }

  orStay(stay, record) {
    return record < 0 ? stay : { bucket: stay.bucket, record };
  }

  /** A line further up or down, or in another bucket the record nearest in its place. */
  beside({ bucket, record }, step) {
    const { perLine, width } = this.gridOf(bucket);
    const onLine = record + step * perLine;
    if (Math.abs(step) === 1 && onLine >= 0 && onLine < bucket.count) return { bucket, record: onLine };
    const buckets = this.items.filter((item) => !item.isHeading).map((item) => item.bucket);
    const at = buckets.indexOf(bucket);
    const other = buckets[Math.min(Math.max(at + step, 0), buckets.length - 1)];
    if (other === bucket || other.count === 0) return { bucket, record };
    const grid = this.gridOf(other);
    const column = Math.min(Math.floor(((record % perLine) + 0.5) * width / grid.width), grid.perLine - 1);
    const lastLine = Math.floor((other.count - 1) / grid.perLine);
    const line = step > 0 ? 0 : lastLine;
    return { bucket: other, record: Math.min(line * grid.perLine + column, other.count - 1) };
  }

  damagedAfter({ bucket, record }) {
    const buckets = this.items.filter((item) => !item.isHeading).map((item) => item.bucket);
    const at = buckets.indexOf(bucket);
    for (let i = 0; i <= buckets.length; ++i) {
      const other = buckets[(at + i) % buckets.length];
      if (other.damaged === "") continue;
      const found = other.unpacked.damaged.indexOf(1, i === 0 ? record + 1 : 0);
      if (found >= 0) return { bucket: other, record: found };
    }
    return { bucket, record };
  }
}
