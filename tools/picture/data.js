// What the page shows: pools, their size classes, their buckets, and the records of a bucket, which
// are unpacked when they are first asked for.
"use strict";

const Type = Object.freeze({ free: 0, used: 1, ext: 2, unknown: 3 });
const typeNames = ["FREE", "USED", "EXT", "UNKN"];

const isPair = data.files.length === 2;

const digits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
const digitOf = new Uint8Array(128);
for (let i = 0; i < 64; ++i) digitOf[digits.charCodeAt(i)] = i;

/** A stream of bits, six per character. */
class Bits {
  constructor(text) {
    this.text = text;
    this.at = 0;
  }

  take(width) {
    let value = 0;
    for (const end = this.at + width; this.at < end; ++this.at) {
      const digit = digitOf[this.text.charCodeAt(Math.floor(this.at / 6))];
      value = value * 2 + ((digit >> (5 - (this.at % 6))) & 1);
    }
    return value;
  }
}

/** The sum of the values that some items have under a key. */
const sumOf = (items, key) => items.reduce((sum, item) => sum + (item[key] ?? 0), 0);

/** A flag per record; those beyond the end of the text are false. */
function flagsOf(text, count) {
  const bits = new Bits(text);
  const flags = new Uint8Array(count);
  for (let i = 0; i < Math.min(count, text.length * 6); ++i) flags[i] = bits.take(1);
  return flags;
}

class Bucket {
  constructor(pool, columns, i) {
    for (const key in columns) this[key] = columns[key][i];
    this.pool = pool;
    this.index = i;
    this.change ??= "";
    this.dataSize = Math.max(0, this.recSize - pool.sizeofHeader);
    this.percent = this.count > 0 ? (this.used * 100) / this.count : 0;
    this.isDamaged = this.damaged !== "" || pool.faultyBuckets.has(i);
  }

  /** Types, next offsets of the free ones, damage, and what was in use before. */
  get unpacked() {
    this.cache ??= {
      ...this.unpackRecords(),
      damaged: flagsOf(this.damaged, this.count),
      before: flagsOf(this.before ?? "", this.count),
    };
    return this.cache;
  }

  offsetOf(record) {
    return 2 + record * this.recSize;
  }

  /** The record at an offset, -1 if there is none. */
  recordAt(offset) {
    const record = (offset - 2) / this.recSize;
    return Number.isInteger(record) && record >= 0 && record < this.count ? record : -1;
  }

  addressOf(record) {
    const base = BigInt("0x" + this.addr) + BigInt(this.pool.sizeofBucket - 2);
    return "0x" + (base + BigInt(this.offsetOf(record))).toString(16);
  }

  isHead(record) {
    return this.change !== "went" && this.offsetOf(record) === this.head &&
      this.unpacked.type[record] === Type.free;
  }

  faultsOf(record) {
    return this.pool.faults.filter((fault) => fault.bucket === this.index && fault.record === record);
  }

  // The codes are those of tools/picture/Data.cpp.
  unpackRecords() {
    const bits = new Bits(this.records);
    const type = new Uint8Array(this.count);
    const next = new Float64Array(this.count);
    const width = this.count.toString(2).length;
    for (let i = 0; i < this.count; ++i) {
      if (bits.take(1) === 0) {
        type[i] = Type.used;
      } else if (bits.take(1) === 1) {
        const index = bits.take(width);
        next[i] = index === this.count ? 0 : this.offsetOf(index);
      } else if (bits.take(1) === 1) {
        next[i] = this.offsetOf(i + 1);
      } else if (bits.take(1) === 1) {
        next[i] = this.offsetOf(i - 1);
      } else if (bits.take(1) === 1) {
        next[i] = bits.take(32);
      } else {
        type[i] = bits.take(1) === 1 ? Type.ext : Type.unknown;
      }
    }
    return { type, next };
  }
}

class Pool {
  constructor(source, index) {
    Object.assign(this, source);
    this.index = index;
    this.faults = source.faults.map(([line, bucket, record, text]) => ({ line, bucket, record, text }));
    this.faultyBuckets = new Set(this.faults.map((fault) => fault.bucket));
    this.buckets = source.buckets.id.map((_, i) => new Bucket(this, source.buckets, i));
    this.classes = this.makeClasses();
    this.presentBuckets = this.buckets.filter((bucket) => bucket.change !== "went").length;
    this.presentExt = source.ext.filter((row) => row[2] !== "went").length;
    this.label = source.name === "" ? "(no name)" : source.name;
    this.came = sumOf(this.buckets, "came");
    this.went = sumOf(this.buckets, "went");
    // The strips of a pool share one scale: bytes of the largest record area.
    this.area = this.classes.reduce((area, sizeClass) => Math.max(area, sizeClass.area), 1);
  }

  makeClasses() {
    const classes = new Map();
    for (const bucket of this.buckets) {
      const { group, recSize, dataSize } = bucket;
      const key = `${group} ${recSize}`;
      if (!classes.has(key))
        classes.set(key, { group, recSize, dataSize, buckets: 0, used: 0, free: 0, records: 0, came: 0, went: 0, area: 0 });
      const sizeClass = classes.get(key);
      bucket.sizeClass = sizeClass;
      sizeClass.area = Math.max(sizeClass.area, bucket.count * recSize);
      sizeClass.came += bucket.came ?? 0;
      sizeClass.went += bucket.went ?? 0;
      if (bucket.change === "went") continue;
      sizeClass.buckets += 1;
      sizeClass.used += bucket.used;
      sizeClass.free += bucket.free;
      sizeClass.records += bucket.used + bucket.free;
    }
    return [...classes.values()].sort((a, b) => a.group - b.group || a.recSize - b.recSize);
  }
}

const pools = data.pools.map((source, i) => new Pool(source, i));
