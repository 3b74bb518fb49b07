// The buckets of a pool, each a row with a strip of its records; many share a row that unfolds. Of
// thousands of rows only those in view are elements; their strips are canvases, drawn when they come
// into view.
"use strict";

const rowMetrics = { fold: 28, pad: 3, text: 22, narrow: 720, over: 400 };

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

/** A place in a list is an item, which is a bucket or a fold, and a record of the bucket. */
class BucketList {
  constructor(pool) {
    this.pool = pool;
    this.folds = foldsOf(pool);
    this.sizeClass = null; // the one that is shown alone
    this.sort = { column: bucketColumns[0], isDescending: false };
    this.rows = new Map(); // by place in this.items
    this.cursor = null; // the place at the keyboard's focus, as this.pointed is that at the pointer
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
    this.turn = make("button", { type: "button", class: "turn", click: () => this.turnAll() });
    this.arrange();
  }

  /** Shows one size class alone, or all of them for null. */
  filter(sizeClass) {
    this.sizeClass = sizeClass;
    for (const fold of this.folds) if (fold.sizeClass === sizeClass) fold.isOpen = true;
    this.arrange();
    this.layOut();
  }

  /** Brings the buckets into their order. That of the report is the one in which they share rows. */
  arrange() {
    const { column, isDescending } = this.sort;
    const folds = this.folds.filter((fold) => this.sizeClass === null || fold.sizeClass === this.sizeClass);
    this.buckets = folds.flatMap((fold) => fold.buckets);
    this.isFolded = column === bucketColumns[0] && !isDescending;
    if (!this.isFolded) this.buckets.sort(compareBy(column.key, isDescending));
    this.items = this.isFolded ? folds.flatMap((fold) => fold.rows) : this.buckets;
    this.turn.hidden = !this.isFolded;
    this.turn.replaceChildren(this.isClosed ? "unfold all" : "fold all");
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
      top += this.heightOf(item);
    }
    this.body.style.height = `${top}px`;
    this.clear();
    this.render();
  }

  /** Opens all folds if one of them is closed, and else closes them. */
  turnAll() {
    const isOpen = this.isClosed;
    for (const fold of this.allFolds) fold.isOpen = isOpen;
    this.arrange();
    this.layOut();
  }

  get allFolds() {
    return this.folds.flatMap((fold) => [fold, ...fold.parts.filter((part) => part instanceof Fold)]);
  }

  get isClosed() {
    return this.allFolds.some((fold) => !fold.isOpen);
  }

  toggle(fold) {
    fold.isOpen = !fold.isOpen;
    this.arrange();
    this.layOut();
  }

  heightOf(item) {
    const text = this.isNarrow ? rowMetrics.text : 0;
    if (item instanceof Fold) return rowMetrics.fold + text;
    return this.linesOf(item) * cellMetrics.line + 2 * rowMetrics.pad + text;
  }

  linesOf(bucket) {
    return Math.max(1, Math.ceil(bucket.count / this.gridOf(bucket).perLine));
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

  makeRow(item) {
    if (item instanceof Fold) return this.makeFold(item);
    const row = make("div", { class: `row ${item.change}` },
      ...bucketColumns.map((column) => make("span", { class: column.kind ?? null }, column.show(item))), make("canvas"));
    if (item.change !== "")
      row.children[0].prepend(make("span", { class: `${item.change} sign` }, item.change === "came" ? "+ " : "− "));
    row.item = item;
    this.paint(row);
    return row;
  }

  makeFold(fold) {
    const row = make("div", { class: "row fold" }, make("span", { class: "title" }, make("span", { class: "arrow" }, fold.isOpen ? "▾" : "▸"), ` ${fold.title} `,
      make("span", { class: "quiet" }, fold.about)),
    make("span", { class: "share" }, makeBar(fold.used / Math.max(1, fold.total), "whole"),
      ...fold.captions.map(([kind, text]) => make("span", { class: kind }, text))));
    row.classList.toggle("class", fold.sizeClass !== undefined);
    row.classList.toggle("current", this.cursor?.item === fold);
    row.item = fold;
    return row;
  }

  paint(row) {
    const bucket = row.item;
    const { width, perLine } = this.gridOf(bucket);
    const { side } = cellMetrics; // room for a frame around the outer cells
    const context = prepareCanvas(row.querySelector("canvas"), this.strip + 2 * side,
      this.linesOf(bucket) * cellMetrics.line);
    context.translate(side, 0);
    const place = (record) => [(record % perLine) * width, Math.floor(record / perLine) * cellMetrics.line, width];
    for (let i = 0; i < bucket.count; ++i)
      paintCell(context, lookOf(bucket, i), bucket.isHead(i), ...place(i));
    for (const marked of [this.pointed, this.cursor]) {
      if (marked?.item !== bucket) continue;
      const next = bucket.recordAt(bucket.unpacked.next[marked.record]);
      if (next >= 0) paintFrame(context, true, ...place(next));
      paintFrame(context, false, ...place(marked.record));
    }
  }

  repaint(item) {
    for (const row of this.rows.values())
      if (row.item !== item) continue;
      else if (item instanceof Fold) row.classList.toggle("current", this.cursor?.item === item);
      else this.paint(row);
  }

  /** The place of a record's cell in the window, null for a fold and for what isn't in view. */
  boxOf({ item, record }) {
    const row = [...this.rows.values()].find((r) => r.item === item);
    if (row === undefined || item instanceof Fold) return null;
    const { width, perLine } = this.gridOf(item);
    const box = row.querySelector("canvas").getBoundingClientRect();
    const left = box.left + cellMetrics.side + (record % perLine) * width;
    const top = box.top + Math.floor(record / perLine) * cellMetrics.line;
    return { left, width, top, bottom: top + cellMetrics.line };
  }

  /** The record under the pointer, null for none. */
  under(event) {
    if (event.target.tagName !== "CANVAS") return null;
    const { item } = event.target.closest(".row");
    const { width, perLine } = this.gridOf(item);
    const column = Math.floor((event.offsetX - cellMetrics.side) / width);
    const record = Math.floor(event.offsetY / cellMetrics.line) * perLine + column;
    return column >= 0 && column < perLine && record >= 0 && record < item.count ? { item, record } : null;
  }

  /** Moves one of the two marks, and shows the record at the last one. */
  mark(which, place) {
    const old = this[which];
    if (old?.item === place?.item && old?.record === place?.record) return;
    this[which] = place;
    if (old !== null && old.item !== place?.item) this.repaint(old.item);
    if (place !== null) this.repaint(place.item);
    this.showTip();
  }

  showTip() {
    const shown = this.pointed ?? (document.activeElement === this.body ? this.cursor : null);
    const box = shown === null ? null : this.boxOf(shown);
    if (box === null) tip.hide();
    else tip.show(shown.item, shown.record, box);
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
    const item = event.target.closest(".row")?.item;
    if (item instanceof Fold) this.toggle(item);
    this.mark("cursor", item instanceof Fold ? { item, record: 0 } : this.under(event));
  }

  enter() {
    if (!this.body.matches(":focus-visible")) return;
    const start = this.cursor ?? this.firstInView();
    if (start !== null) this.go(start.item, start.record);
  }

  /** Where the cursor begins. */
  firstInView() {
    const top = this.head.getBoundingClientRect().bottom - this.body.getBoundingClientRect().top;
    const item = this.items.find((_, i) => this.tops[i] >= top);
    return item === undefined ? null : { item, record: 0 };
  }

  leave() {
    const old = this.cursor;
    this.cursor = null;
    if (old !== null) this.repaint(old.item);
    tip.hide();
  }

  /** Puts the cursor on a place, unfolds it and brings it into view. */
  go(item, record) {
    if (!this.items.includes(item)) {
      for (let { fold } = item; fold !== undefined; { fold } = fold) fold.isOpen = true;
      this.arrange();
      this.layOut();
    }
    const box = this.body.getBoundingClientRect();
    const top = box.top + this.tops[this.items.indexOf(item)], bottom = top + this.heightOf(item);
    const margin = 120; // for what sticks to the window's top, and for the tip
    if (top < margin || bottom > window.innerHeight - margin)
      window.scrollBy({ top: top - window.innerHeight / 2, behavior: "instant" });
    this.render();
    this.mark("cursor", { item, record });
    tip.speak(item, record);
  }

  press(event) {
    if (event.ctrlKey || event.altKey || event.metaKey || event.target !== this.body) return;
    if (event.key === "Escape") return this.mark("cursor", null);
    const start = this.cursor ?? this.firstInView();
    if (start === null) return;
    const fold = start.item instanceof Fold ? start.item : this.isFolded ? start.item.fold : null;
    if (event.key === "Enter" || event.key === " ") {
      event.preventDefault();
      if (fold === null) return;
      this.toggle(fold);
      return this.go(fold, 0);
    }
    const target = this.targetOf(event.key, start);
    if (target === null) return;
    event.preventDefault();
    this.unpoint();
    this.go(target.item, target.record);
  }

  /** The place that a key leads to, null for other keys. */
  targetOf(key, { item, record }) {
    switch (key) {
      case "ArrowUp": return this.beside(item, record, -1);
      case "ArrowDown": return this.beside(item, record, 1);
      case "PageUp": return this.beside(item, record, -10);
      case "PageDown": return this.beside(item, record, 10);
      case "d": return this.damagedAfter(item, record);
      default: return item instanceof Fold ? null : this.within(key, item, record);
    }
  }

  /** The record of the same bucket that a key leads to, null for other keys. */
  within(key, bucket, record) {
    const at = (to) => ({ item: bucket, record: Math.min(Math.max(to, 0), bucket.count - 1) });
    const atOffset = (offset) => {
      const to = bucket.recordAt(offset);
      return at(to < 0 ? record : to);
    };
    switch (key) {
      case "ArrowLeft": return at(record - 1);
      case "ArrowRight": return at(record + 1);
      case "Home": return at(0);
      case "End": return at(bucket.count - 1);
      case "n": return atOffset(bucket.unpacked.next[record]);
      case "h": return atOffset(bucket.head);
      default: return null;
    }
  }

  /** A line further up or down, or in another row the record nearest in its place. */
  beside(item, record, step) {
    const { perLine, width } = item instanceof Fold ? { perLine: 1, width: 0 } : this.gridOf(item);
    const onLine = record + step * perLine;
    if (Math.abs(step) === 1 && onLine >= 0 && onLine < item.count) return { item, record: onLine };
    const at = this.items.indexOf(item);
    const other = this.items[Math.min(Math.max(at + step, 0), this.items.length - 1)];
    if (other === item || other.count === 0) return { item, record };
    if (other instanceof Fold) return { item: other, record: 0 };
    const grid = this.gridOf(other);
    const column = Math.min(Math.floor(((record % perLine) + 0.5) * width / grid.width), grid.perLine - 1);
    const lastLine = Math.floor((other.count - 1) / grid.perLine);
    const line = step > 0 ? 0 : lastLine;
    return { item: other, record: Math.min(line * grid.perLine + column, other.count - 1) };
  }

  damagedAfter(item, record) {
    const isFold = item instanceof Fold;
    const at = Math.max(0, this.buckets.indexOf(isFold ? item.buckets[0] : item));
    for (let i = 0; i <= this.buckets.length; ++i) {
      const bucket = this.buckets[(at + i) % this.buckets.length];
      if (bucket.damaged === "") continue;
      const found = bucket.unpacked.damaged.indexOf(1, i === 0 && !isFold ? record + 1 : 0);
      if (found >= 0) return { item: bucket, record: found };
    }
    return { item, record };
  }
}
