// Which buckets share a row of a list: those of a size class, and within it those that look alike.
"use strict";

// From how many buckets on they share a row, and how many rows a list begins with at most.
const foldLimits = { alike: 2, partly: 20, rows: 24 };

/** Buckets that share a row, which unfolds to its parts: folds and buckets. */
class Fold {
  constructor(title, about, parts) {
    Object.assign(this, { title, about, parts, isOpen: false });
    for (const part of parts) part.fold = this;
    const present = this.buckets.filter((bucket) => bucket.change !== "went");
    this.used = sumOf(present, "used");
    this.total = this.used + sumOf(present, "free");
  }

  get buckets() {
    return this.parts.flatMap((part) => (part instanceof Fold ? part.buckets : [part]));
  }

  get rows() {
    return [this, ...(this.isOpen ? this.parts.flatMap((part) => (part instanceof Fold ? part.rows : [part])) : [])];
  }

  /** What the row says beside its title, each with its kind. */
  get captions() {
    const numDamaged = this.buckets.filter((bucket) => bucket.isDamaged).length;
    const captions = numDamaged === 0 ? [] : [["fault", counted(numDamaged, "damaged bucket")]];
    captions.push(["quiet", `${formatNumber(this.used)} of ${counted(this.total, "record")} in use`]);
    for (const [kind, sign] of [["came", "+"], ["went", "−"]]) {
      const records = sumOf(this.buckets, kind);
      if (records > 0) captions.push([kind, sign + formatNumber(records)]);
    }
    return captions;
  }
}

const quarters = ["under 25 % used", "25 to 50 % used", "50 to 75 % used", "over 75 % used"];

/** How a bucket looks from afar, "" for one that has a row of its own. */
function stateOf(bucket) {
  const { used, free, count } = bucket;
  if (bucket.isDamaged || count === 0 || used + free !== count) return "";
  if (free === 0) return "full";
  if (used === 0) return "empty";
  return quarters[Math.floor((used * 4) / count)];
}

const changed = " with changes";

/** What has happened to a bucket between two reports. */
function eventOf(bucket) {
  if (bucket.change === "came") return " that came";
  if (bucket.change === "went") return " that went";
  return isPair && bucket.came + bucket.went > 0 ? changed : "";
}

const isQuarter = (state) => quarters.includes(state);

function makeGroup({ state, event, buckets }) {
  const title = isQuarter(state) ? `${counted(buckets.length, "bucket")}${event}, ${state}`
    : `${counted(buckets.length, `${state} bucket`)}${event}`;
  return new Fold(title, "", buckets);
}

/**
 * The parts of a size class, whose buckets come in the order of the report. Full ones share a row, and
 * empty ones do. Where many are left, those of a quarter share one too, and the fullest come first.
 */
function partsOf(buckets) {
  const groups = new Map();
  for (const bucket of buckets) {
    const state = stateOf(bucket), event = eventOf(bucket);
    const key = state === "" ? bucket : `${state}${event}`;
    if (!groups.has(key)) groups.set(key, { state, event, buckets: [] });
    groups.get(key).buckets.push(bucket);
  }
  const isWhole = ({ state, event }) => state !== "" && !isQuarter(state) && event !== changed;
  const rest = [...groups.values()].filter((group) => !isWhole(group));
  const isMany = sumOf(rest.map((group) => group.buckets), "length") > foldLimits.partly;
  const parts = [...groups.values()].flatMap((group) => {
    const isFold = group.buckets.length >= foldLimits.alike && (isMany || isWhole(group));
    return isFold ? [makeGroup(group)] : group.buckets;
  });
  const first = (part) => (part instanceof Fold ? part.buckets[0] : part);
  parts.sort(compareBy((part) => first(part).id, false));
  if (isMany) parts.sort(compareBy((part) => Math.floor(first(part).percent / 25), true));
  return parts;
}

/** A fold for each size class. They begin unfolded if a screen holds them so. */
function foldsOf(pool) {
  const folds = pool.classes.map((sizeClass) => {
    const buckets = pool.buckets.filter((bucket) => bucket.sizeClass === sizeClass);
    buckets.sort(compareBy((bucket) => bucket.id, false));
    const parts = partsOf(buckets);
    const fold = new Fold(counted(sizeClass.dataSize, "byte"), counted(sizeClass.buckets, "bucket"), parts);
    fold.sizeClass = sizeClass;
    return fold;
  });
  const isShort = folds.reduce((sum, fold) => sum + 1 + fold.parts.length, 0) <= foldLimits.rows;
  for (const fold of folds) fold.isOpen = isShort;
  return folds;
}
