#!/usr/bin/env python3
"""Draws reports of pools at random work, and compares in a browser what the page says with them.

usage: picture_test.py VOKMEMPOOL POOL_CHILD CHROMIUM
"""
import random
import re
import sys
import tempfile
from collections import defaultdict
from contextlib import chdir
from itertools import groupby
from pathlib import Path

from browser import Browser
from support import Work, data_of, same, tool

BUCKETS = """pools.map((pool) => pool.buckets.map((bucket) => [countLooks(bucket),
  [...bucket.unpacked.type.keys()].filter((i) => bucket.unpacked.type[i] === Type.free)
  .map((i) => [bucket.offsetOf(i), bucket.unpacked.next[i], bucket.addressOf(i)])]))"""
CHANGES = """pools.map((pool) => [pool.came, pool.went,
  pool.buckets.map(countLooks).reduce((sum, looks) => sum + looks.came, 0)])"""
OVERVIEW = """[...document.querySelectorAll("[aria-label='All pools'] tr")].slice(1).map((row) =>
  [...row.cells].slice(0, -1).map((cell) => cell.innerText.replaceAll(",", "")))"""
FOLDS = """[...document.querySelectorAll(".fold")]
  .map((row) => row.innerText.replaceAll("\\n", " "))"""
IDS = """[...document.querySelectorAll(".strips .row:not(.fold)")]
  .map((row) => row.children[0].innerText)"""
SMALL = ("--detailed", "--bucket-size", 322, "--max-record-size", 100, "--keep-empty-buckets",
         "--at")


def draw(browser, *reports):
    files = ["before.txt", "now.txt"][-len(reports):]
    for file, text in zip(files, reports):
        Path(file).write_text(text)
    tool("picture", *files, "-o", "page.html")
    browser.open("page.html")


def used_in(bucket):
    return {row["offset"] for row in bucket["records"]["rows"] if row["type"] == "USED"}


def looks_and_links_of(bucket):
    used = len(used_in(bucket))
    free = len(bucket["records"]["rows"]) - used
    looks = dict(used=used, free=max(free - 1, 0), next=min(free, 1), damaged=0, came=0, went=0)
    links = [[row[key] for key in ("offset", "next", "addr")] for row in bucket["freeList"]["rows"]]
    return [looks, sorted(links)]


def classes_of(pool):
    """What the page says of a pool's size classes."""
    lines = []
    for size, group in groupby(pool, lambda bucket: bucket["header"]["recSize"]):
        buckets = list(group)
        used = sum(len(used_in(bucket)) for bucket in buckets)
        total = sum(len(bucket["records"]["rows"]) for bucket in buckets)
        lines.append(f"{size - 4} bytes, {len(buckets)} bucket{'s' * (len(buckets) > 1)}, "
                     f"{used} of {total} records in use")
    return lines


def test_one(browser, text):
    """The cells, the tables, the links, the keyboard, the pointer and the order."""
    draw(browser, text)
    pools = [pool["bucketReports"] for pool in data_of(text)]
    expected = [list(map(looks_and_links_of, pool)) for pool in pools]
    same(browser.evaluate(BUCKETS), expected, "the cells and the links")
    same(browser.evaluate("lists.map((list) => list.folds.map((fold) => tip.wordsOfFold(fold)))"),
         [[line + ", folded" for line in classes_of(pool)] for pool in pools], "the size classes")
    rows = [re.split("  +", line) for line in tool("report", given=text).splitlines()[1:]]
    for row, pool in zip(rows, pools):
        row.insert(4, len(pool))
    sums = [sum(int(row[i]) for row in rows) for i in range(1, 7)]
    rows.append(["Total", *sums, f"{100 * sums[5] / sums[4]:.1f} %"])
    same(browser.evaluate(OVERVIEW), [list(map(str, row)) for row in rows], "all pools, their total")

    def tip_has(part, *what, act=browser.press):
        act(*what)
        tip = browser.evaluate("(tip.element.hidden ? 'hidden' : '') + tip.element.innerText")
        same(part in tip, True, f"{what}: {tip!r} lacks {part!r}")

    bucket = pools[0][0]
    rows = bucket["records"]["rows"]
    browser.evaluate("document.querySelector('.head button').focus()")
    # Past the headings, into the list, whose size classes are folded.
    tip_has("hidden", *["Tab"] * 6, "PageUp")
    same(browser.evaluate("tip.spoken.innerText"), classes_of(pools[0])[0] + ", folded",
         "what is said of a fold")
    tip_has(f"record 2 of {len(rows)}\n", "Enter", "ArrowDown", "ArrowRight")
    tip_has(f"offset\n{rows[1]['offset']} to {rows[1]['end']}\n")
    tip_has(f"offset\n{bucket['header']['freeHead']} to", "h")
    same("served next" in browser.evaluate("tip.spoken.innerText"), True, "what is said aloud")
    tip_has(f"offset\n{bucket['freeList']['rows'][0]['next']} to", "n")
    tip_has("hidden", "Escape")
    x, y = browser.evaluate("""[document.querySelector('.strips canvas').getBoundingClientRect()]
        .flatMap((box) => [box.left + 3, box.top + 10])""")
    tip_has("hidden", 1, 1, act=browser.move)
    tip_has(f"record 1 of {len(rows)}\n", x, y, act=browser.move)
    tip_has("hidden", 1, 1, act=browser.move)
    tip_has(f"record 4 of {len(rows)}\n", x + 12, y, act=browser.tap)
    browser.evaluate("document.querySelector('.head').querySelectorAll('button')[2].focus()")
    browser.press("Enter")
    same(browser.evaluate("document.querySelectorAll('.strips .row > span')[2].innerText"),
         str(max(len(used_in(bucket)) for bucket in pools[0])), "the most used bucket first")

    # A record of an unknown type, and links that lead to no record: far away, into one and after the
    # last.
    damaged = re.sub("(00001 )(USED|FREE)", r"\1UNKN", text, count=1)
    places = ["9999", "3", str(rows[-1]["end"])]
    links = iter(places)
    draw(browser, re.sub(r"(?<=n=)[\d ]{6}(?=\|)", lambda _: f"{next(links):6}", damaged, count=3))
    browser.evaluate("document.querySelector('.strips').focus()")
    tip_has("type\nUNKN", "PageUp", "d")
    same("1 damaged bucket" in browser.evaluate(FOLDS)[0], True, "the damage in its size class")
    for place in places:
        tip_has(f"next\n{place}, no record", "d")


def test_pair(browser, before, now):
    draw(browser, before, now)
    held = [[{(bucket["header"]["addr"], bucket["header"]["recSize"], offset)
              for bucket in pool["bucketReports"] for offset in used_in(bucket)}
             for pool in data_of(text)] for text in (before, now)]
    same(browser.evaluate(CHANGES), [[len(later - earlier), len(earlier - later),
                                      len(later - earlier)] for earlier, later in zip(*held)],
         "what came and went, and the cells that came")


def test_folds(browser):
    """Full and empty buckets share a row, also those that came and went."""
    data = [f"a0:{i + 1:x}000:" for i in range(140)]
    trace = "".join(f"zvpt:a:{record}12\n" for record in data)
    trace += "".join(f"zvpt:f:{record}\n" for record in data[:41])
    text = tool("trace", *SMALL, 181, given=trace)
    draw(browser, text)
    same(browser.evaluate(FOLDS), ["▾ 12 bytes 7 buckets 99 of 140 records in use",
                                   "▸ 4 full buckets 80 of 80 records in use",
                                   "▸ 2 empty buckets 0 of 40 records in use"], "what looks alike")
    browser.evaluate("document.querySelector('.strips').focus()")
    browser.press("Home", "ArrowDown", "Enter")
    same(browser.evaluate(IDS), ["1", "2", "3", "4", "5"], "unfolded buckets, and a single one")
    browser.press("ArrowDown", "Enter")
    same(browser.evaluate(IDS), ["5"], "folded from one of them")

    draw(browser, text, re.sub("0x.", "0xe", text))  # the same at other addresses
    same(browser.evaluate(FOLDS), ["▾ 12 bytes 7 buckets 99 of 140 records in use +99 −99",
                                   "▸ 4 full buckets that came 80 of 80 records in use +80",
                                   "▸ 4 full buckets that went 0 of 0 records in use −80",
                                   "▸ 2 empty buckets that came 0 of 40 records in use",
                                   "▸ 2 empty buckets that went 0 of 0 records in use"],
         "what came and went")


def test_off(browser, text):
    off = tool("trace", "--off", "--detailed", "--at", 1, given="zvpt:c:a0\n")
    leads = "[...document.querySelectorAll('h2, .lead, .legend, #keys')].map((e) => e.innerText)"
    draw(browser, off)
    same(browser.evaluate(leads), ["1 pool with pooling off.", "a0off",
                                   "Pooling is off: requests go to the heap."], "a pool that is off")
    draw(browser, text + off)
    same((browser.evaluate(leads)[0][:15], browser.evaluate(OVERVIEW)[2]),
         ("3 pools (1 off)", ["a0 (off)", *"000000", "–"]), "one of three that is off")


def test_phone(browser, before, now):
    """Nothing but what scrolls by itself is wider than the screen."""
    browser.resize(420)
    draw(browser, before, now)
    browser.evaluate("lists[0].turnAll()")
    same(browser.evaluate("""[...document.querySelectorAll("body *:not(.scroll *)")]
        .filter((part) => part.getBoundingClientRect().right > 420)
        .map((part) => part.outerHTML)"""), [], "parts beyond the edge of a phone")
    browser.resize(1280)


def test_many(browser):
    """10,000 buckets, of which 1,097 stay full, and half of the others' records freed."""
    data = [f"a0:{i + 1:x}000:" for i in range(200000)]
    trace = "".join(f"zvpt:a:{record}12\n" for record in data)
    freed = random.Random(5).sample(data[21940:], 100000)
    trace += "".join(f"zvpt:f:{record}\n" for record in freed)
    text = tool("trace", *SMALL, 300000, given=trace)
    draw(browser, text)
    same(Path("page.html").stat().st_size < 5e6, True, "5 MB for 10,000 buckets")
    drawn = browser.evaluate("performance.getEntriesByName('drawn')[0].startTime")
    same(drawn < 2000, True, f"{drawn} ms for the first drawing")

    used = defaultdict(list)  # by quarter; the only empty bucket has a row of its own
    for number, row in re.findall(r"^ +(\d+) +\d+ +(\d+) +\d+ +20 .*% +16 0x", text, re.M):
        if row == "0":
            empty = number
        else:
            used[int(row) // 5].append(int(row))
    names = ["under 25 % used", "25 to 50 % used", "50 to 75 % used", "over 75 % used"]
    rows = [f"▸ {len(used[i]):,} buckets, {names[i]} "
            f"{sum(used[i]):,} of {20 * len(used[i]):,} records in use" for i in (3, 2, 1, 0)]
    same(browser.evaluate(FOLDS), ["▾ 12 bytes 10,000 buckets 100,000 of 200,000 records in use",
                                   "▸ 1,097 full buckets 21,940 of 21,940 records in use", *rows],
         "the folds")
    same(browser.evaluate("pools[0].section.offsetHeight < window.innerHeight"), True,
         "a pool's overview fits a screen")
    browser.evaluate("lists[0].turn.click(); window.scrollTo(0, document.body.scrollHeight)")
    browser.settle()
    rows = browser.evaluate(IDS)
    same((rows[-1:], len(rows) < 200), ([empty], True), f"rows in view: {rows}")


half_time, end = Work(116, 3000, names=("</script><b>", "second")).reports
with tempfile.TemporaryDirectory() as folder, Browser(sys.argv[3]) as chromium, chdir(folder):
    test_one(chromium, end)
    test_pair(chromium, half_time, end)
    test_folds(chromium)
    test_off(chromium, end)
    test_phone(chromium, half_time, end)
    test_many(chromium)
    same(chromium.messages, [], "messages in the console")
