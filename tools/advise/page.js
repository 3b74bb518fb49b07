// The page: the answer, what the program asks of its heap, and its call sites.
"use strict";

const leastShare = 0.01; // of a site that is shown at once

function drawHead() {
  const program = data.command[0].split("/").pop();
  document.title = `Would a pool help ${program}?`;
  const facts = {
    "events": formatNumber(data.events),
    "requests": `${formatNumber(data.requests)} of ${formatNumber(data.bytes)} bytes`,
    "by realloc": formatNumber(data.reallocs),
    "threads": formatNumber(data.threads),
    "peak": `${formatNumber(data.peakBytes)} bytes, after event ${formatNumber(data.peakEvent)}`,
    "live at the end": `${counted(data.live, "block")} of ${counted(data.liveBytes, "byte")}`,
  };
  if (data.lost > 0) facts["events lost"] = formatNumber(data.lost);
  if (data.cut) facts["recording"] = "cut, and read to its last whole block";
  document.getElementById("head").append(
    make("p", { class: "kicker" }, "libVokMemPool"),
    make("h1", {}, `Would a pool help ${program}?`),
    make("p", { class: "answer" }, data.answer),
    make("dl", { class: "facts" }, ...Object.entries(facts).map(([name, value]) =>
      make("div", {}, make("dt", {}, name), make("dd", {}, value)))),
    make("pre", {}, data.command.join(" ")));
}

function siteOf(site) {
  const caller = site.callers[0]?.from ?? "";
  return make("li", { class: "site" },
    make("span", { class: "share" }, `${(100 * site.requests / data.requests).toFixed(1)}%`),
    make("span", { class: "dot", style: `--hue: ${site.hue}` }), make("span", { class: "where" }, site.where),
    caller === "" ? null : make("p", { class: "quiet" }, `from ${caller}`),
    make("p", {}, `${counted(site.requests, "request")} of ${site.sizes} bytes, ` +
      `${formatNumber(site.bytesAtPeak)} bytes at the peak`),
    make("p", { class: site.candidate ? "yes" : "quiet" },
      `${site.candidate ? "could have a pool" : "no"}: ${site.reason}`),
    site.difference === undefined ? null
      : make("p", {}, `alone in a pool: ${formatInterval(site.difference)}`));
}

function drawSites() {
  const isLarge = (site, i) => i < 3 || site.requests >= leastShare * data.requests;
  const shown = data.sites.filter(isLarge);
  const rest = data.sites.filter((site, i) => !isLarge(site, i));
  document.getElementById("sites").append(
    make("h2", {}, "Call sites, by requests"), make("ol", {}, ...shown.map(siteOf)),
    rest.length === 0 ? "" : make("details", {},
      make("summary", {}, `${formatNumber(rest.length)} more, each with less than 1% of the requests`),
      make("ol", {}, ...rest.map(siteOf))));
}

for (const [i, site] of data.sites.entries())
  site.hue = hueOf(i);
drawHead();
drawGains();
drawChange();
drawLive();
drawBlocks();
drawSites();
