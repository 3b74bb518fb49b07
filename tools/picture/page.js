// Puts the page together: its head, the legend, a table of the pools, and a section for each.
"use strict";

const lists = [];

function makeHead() {
  const present = pools.filter((pool) => pool.change !== "went");
  const used = sumOf(present, "used"), free = sumOf(present, "free"), ext = sumOf(present, "presentExt");
  const blocks = counted(sumOf(present, "presentBuckets"), "bucket") +
    (ext > 0 ? ` and ${counted(ext, "ext record")}` : "");
  const off = present.filter((pool) => pool.off).length;
  const lines = [make("p", { class: "lead" }, counted(present.length, "pool"),
    off > 0 && off === present.length ? " with pooling off." : (off > 0 ? ` (${formatNumber(off)} off)` : "") +
      ` with ${blocks}; ${formatNumber(used)} of ${counted(used + free, "record")} in use.`)];
  if (isPair) {
    const came = sumOf(pools, "came"), went = sumOf(pools, "went");
    const ofBuckets = (change) => formatNumber(pools.flatMap((p) => p.buckets).filter((b) => b.change === change).length);
    lines.push(make("p", { class: "lead" }, `Since ${data.files[0]}: ${counted(came, "record")} came, ` +
      `${formatNumber(went)} went; ${ofBuckets("came")} buckets came, ${ofBuckets("went")} went.`));
  }
  const faults = sumOf(pools, "numFaults");
  if (faults > 0)
    lines.push(make("p", { class: "lead fault" }, `${counted(faults, "inconsistency", "inconsistencies")} in the text: see below.`));
  const file = data.files.at(-1) ?? "";
  document.title = `Pools of ${file}`;
  document.getElementById("head").append(
    make("p", { class: "kicker" }, "libVokMemPool"), make("h1", {}, file), ...lines);
}

function makeSwatch(look, isHead) {
  const canvas = make("canvas", { "aria-hidden": "true" });
  canvas.redraw = () => {
    paintCell(prepareCanvas(canvas, 16, cellMetrics.line), look, isHead, 0, 0, 17);
  };
  return canvas;
}

function makeKeys() {
  const keys = (names, does) => make("span", {}, ...names.flatMap((name) => [make("kbd", {}, name), " "]), does);
  return make("p", { id: "keys", class: "quiet keys" }, make("span", {}, "Keys in a list:"),
    keys(["←", "→", "↑", "↓"], "move"), keys(["Home", "End"], "ends of a bucket"),
    keys(["PgUp", "PgDn"], "ten rows"), keys(["Enter"], "unfold"),
    keys(["h"], "served next"), keys(["n"], "next free one"), keys(["d"], "next damaged"), keys(["Esc"], "leave"));
}

function makeGuide() {
  const kinds = [["used", isPair ? "used, as before" : "used"], ["free", "free"], ["free", "served next", true]];
  if (isPair) kinds.push(["came", "came into use"], ["went", "freed"]);
  kinds.push(["damaged", "damaged"]);
  const legend = make("ul", { class: "legend" }, ...kinds.map(([look, text, isHead]) =>
    make("li", {}, makeSwatch(look, isHead), text)));
  const select = make("select", {
    "aria-label": "Go to a pool",
    change: () => {
      pools[select.value].section.scrollIntoView();
      select.value = "";
    },
  }, make("option", { value: "" }, "Go to pool"), ...pools.map((pool) => make("option", { value: pool.index }, pool.label)));
  const guide = document.getElementById("guide");
  if (pools.some((pool) => pool.buckets.length > 0)) {
    document.getElementById("head").append(makeKeys());
    guide.append(legend);
  }
  if (pools.length > 1) guide.append(select);
}

/** What a pool's name is marked with. */
function marksOf(pool) {
  return [pool.change, pool.off ? "off" : ""].filter((mark) => mark !== "");
}

function makeOverview() {
  const held = largest(pools, (pool) => pool.held);
  const columns = [
    { title: "Pool", key: (pool) => pool.label,
      show: (pool) => make("a", { href: `#pool-${pool.index}`, class: pool.change }, pool.label,
        ...marksOf(pool).map((mark) => ` (${mark})`)) },
    numberColumn("Used", "used"), numberColumn("Free", "free"), ...changeColumns(),
    numberColumn("Ext", "presentExt", "ext records"), numberColumn("Buckets", "presentBuckets"),
    numberColumn("Bytes held", "held", "heap blocks with their headers"),
    numberColumn("Payload", "payload", "data bytes of used records"),
    shareColumn("payload of what is held", "payload", "held"),
    { title: "Payload in bytes held", show: (pool) => {
      if (pool.held === 0) return "";
      const outer = makeBar(pool.held / held, "held");
      outer.firstChild.append(makeBar(pool.payload / Math.max(1, pool.held)));
      return outer;
    } },
  ];
  return make("section", {}, make("h2", {}, "All pools"), makeTable("All pools", columns, pools));
}

function makeHistogram(pool) {
  const peak = largest(pool.histogram, (row) => row[1]);
  const columns = [
    { title: "Size", kind: "number", about: "bytes of data", key: (row) => row[0], show: (row) => formatNumber(row[0]) },
    numberColumn("Records", 1),
    ...(isPair ? [{ title: "Change", kind: "number", key: (row) => row[1] - row[2],
      show: (row) => makeDifference(row[1], row[2]),
      total: (rows) => makeDifference(sumOf(rows, 1), sumOf(rows, 2)) }] : []),
    { title: "Records, to scale", show: (row) => makeBar(row[1] / peak) },
  ];
  return make("div", { class: "panel" }, make("h3", {}, "Records in use by size"),
    makeTable(`Records of ${pool.label} in use by size`, columns, pool.histogram));
}

function makeClasses(pool, list) {
  const table = make("div", { class: "panel" });
  const choose = (sizeClass) => {
    list.filter(list.sizeClass === sizeClass ? null : sizeClass);
    for (const button of table.querySelectorAll("button.choice"))
      button.setAttribute("aria-pressed", button.sizeClass === list.sizeClass);
  };
  const columns = [
    { title: "Data", kind: "number", about: "bytes of data in a record", key: (c) => c.dataSize, show: (c) => {
      const button = make("button", {
        type: "button", class: "choice", title: "show the buckets of this size class alone",
        "aria-pressed": list.sizeClass === c ? "true" : "false", click: () => choose(c),
      }, formatNumber(c.dataSize));
      button.sizeClass = c;
      return button;
    } },
    numberColumn("Buckets", "buckets"), numberColumn("Used", "used"), numberColumn("Free", "free"), ...changeColumns(),
    shareColumn("records in use", "used", "records"),
    { title: "Used of all records", show: (c) => makeBar(c.used / Math.max(1, c.records), "whole") },
  ];
  table.append(make("h3", {}, "Size classes"), makeTable(`Size classes of ${pool.label}`, columns, pool.classes));
  return table;
}

function makeDetails(title, ...content) {
  return make("details", {}, make("summary", {}, title), ...content);
}

function makeFaults(pool) {
  if (pool.numFaults === 0) return null;
  const items = pool.faults.map((fault) => make("li", {}, make("span", { class: "quiet" }, `line ${fault.line} `), fault.text));
  const rest = pool.numFaults - items.length;
  if (rest > 0) items.push(make("li", { class: "quiet" }, `and ${formatNumber(rest)} more, which vokmempool report --check lists`));
  const details = makeDetails(counted(pool.numFaults, "inconsistency", "inconsistencies"), make("ul", { class: "faults" }, ...items));
  details.classList.add("fault");
  return details;
}

function makeExt(pool) {
  if (pool.ext.length === 0) return null;
  const columns = [
    { title: "Bytes", kind: "number", key: (row) => row[0], show: (row) => formatNumber(row[0]) },
    { title: "Data at", key: (row) => row[1].padStart(16, "0"), show: (row) => `0x${row[1]}` },
    ...(isPair ? [{ title: "Change", key: (row) => row[2],
      show: (row) => make("span", { class: row[2] || "quiet" }, row[2] || "stayed") }] : []),
  ];
  return makeDetails(counted(pool.ext.length, "ext record"),
    makeTable(`Ext records of ${pool.label}`, columns, pool.ext));
}

function makeSection(pool) {
  const list = new BucketList(pool);
  const numClasses = pool.classes.filter((sizeClass) => sizeClass.buckets > 0).length;
  const header = make("dl", { class: "header" }, ...pool.header.map(([label, value]) =>
    make("div", {}, make("dt", {}, label), make("dd", {}, value))));
  pool.section = make("section", { id: `pool-${pool.index}`, class: pool.change },
    make("h2", {}, pool.label, ...marksOf(pool).map((mark) => make("span", { class: `${mark} badge` }, mark))),
    make("p", { class: "lead" }, pool.buckets.length === 0 ?
      pool.off ? "Pooling is off: requests go to the heap." : "No buckets." :
      `${counted(pool.presentBuckets, "bucket")} of ${counted(numClasses, "size class", "size classes")}, ` +
      `${formatNumber(pool.used)} of ${counted(pool.used + pool.free, "record")} in use.`),
    makeFaults(pool));
  if (pool.histogram.length > 0)
    pool.section.append(make("div", { class: "panels" }, makeHistogram(pool),
      pool.classes.length > 0 ? makeClasses(pool, list) : null));
  else if (pool.classes.length > 0)
    pool.section.append(make("div", { class: "panels" }, makeClasses(pool, list)));
  pool.section.append(...[makeExt(pool), makeDetails("Header block", header)].filter((part) => part !== null));
  if (pool.buckets.length > 0) {
    pool.section.append(make("h3", {}, "Buckets", list.turn), list.element);
    lists.push(list);
  }
  return pool.section;
}

function redraw() {
  readPalette();
  for (const canvas of document.querySelectorAll(".legend canvas")) canvas.redraw();
  for (const list of lists) list.layOut();
}

let isDue = false;
function renderSoon() {
  if (isDue) return;
  isDue = true;
  requestAnimationFrame(() => {
    isDue = false;
    for (const list of lists) list.render();
    for (const list of lists) if (list.cursor !== null || list.pointed !== null) list.showTip();
  });
}

makeHead();
makeGuide();
document.getElementById("pools").replaceChildren(
  ...(pools.length > 1 ? [makeOverview()] : []), ...pools.map(makeSection));
redraw();
window.addEventListener("scroll", renderSoon, { passive: true });
window.addEventListener("resize", redraw);
document.addEventListener("toggle", renderSoon, true);
matchMedia("(prefers-color-scheme: dark)").addEventListener("change", redraw);
requestAnimationFrame(() => performance.mark("drawn"));
