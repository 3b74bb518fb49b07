// What the page says of a record, and aloud of a row that buckets share.
"use strict";

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

  speak(item, record) {
    this.spoken.textContent = item instanceof Fold ? this.wordsOfFold(item) : this.wordsOf(item, record);
  },

  wordsOfFold(fold) {
    const words = [fold.title, fold.about, ...fold.captions.map(([, text]) => text)];
    return [...words, fold.isOpen ? "unfolded" : "folded"].filter((word) => word !== "").join(", ");
  },

  wordsOf(bucket, record) {
    const parts = describe(bucket, record).flatMap((part) =>
      part.tagName === "DL" ? [...part.children].map((pair) => [...pair.children].map((e) => e.textContent).join(" "))
        : [part.textContent]);
    return `Bucket ${bucket.id}: ${parts.join(", ")}`;
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
