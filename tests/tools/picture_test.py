#!/usr/bin/env python3
"""Draws reports of pools at random work, and compares in a browser what the page says with them.

usage: picture_test.py VOKMEMPOOL POOL_CHILD CHROMIUM
"""
import random
import re
import sys
import tempfile
from contextlib import chdir
from pathlib import Path

from browser import Browser
from support import Work, data_of, same, tool

BUCKETS = """pools.map((pool) => pool.buckets.map((bucket) => [countLooks(bucket),
  [...bucket.unpacked.type.keys()].filter((i) => bucket.unpacked.type[i] === Type.free)
  .map((i) => [bucket.offsetOf(i), bucket.unpacked.next[i], bucket.addressOf(i)])]))"""
CHANGES = """pools.map((pool) => [pool.came, pool.went,
  pool.buckets.map(countLooks).reduce((sum, looks) => sum + looks.came, 0)])"""


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


def test_one(browser, text):
    """The cells, the links, the keyboard, the pointer and the order."""
    draw(browser, text)
    pools = [pool["bucketReports"] for pool in data_of(text)]
    expected = [list(map(looks_and_links_of, pool)) for pool in pools]
    same(browser.evaluate(BUCKETS), expected, "the cells and the links")

    def tip_has(part, *what, act=browser.press):
        act(*what)
        tip = browser.evaluate("(tip.element.hidden ? 'hidden' : '') + tip.element.innerText")
        same(part in tip, True, f"{what}: {tip!r} lacks {part!r}")

    bucket = pools[0][0]
    rows = bucket["records"]["rows"]
    browser.evaluate("document.querySelector('.head button').focus()")
    # Past the headings, into the list.
    tip_has(f"record 2 of {len(rows)}\n", *["Tab"] * 6, "PageUp", "Home", "ArrowRight")
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
    tip_has("type\nUNKN", "PageUp", "Home")
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


def test_off(browser):
    draw(browser, tool("trace", "--off", "--detailed", "--at", 1, given="zvpt:c:a0\n"))
    same(browser.evaluate("[...document.querySelectorAll('main h2, main .lead')].map((e) => e.innerText)"),
         ["a0off", "Pooling is off: requests go to the heap."], "a pool that is off")


def test_many(browser):
    """10,000 buckets, and half of their records freed."""
    data = [f"a0:{i + 1:x}000:" for i in range(200000)]
    trace = "".join(f"zvpt:a:{record}12\n" for record in data)
    trace += "".join(f"zvpt:f:{record}\n" for record in random.Random(5).sample(data, 100000))
    draw(browser, tool("trace", "--detailed", "--at", 300000, "--bucket-size", 322,
                       "--max-record-size", 100, "--keep-empty-buckets", given=trace))
    same(Path("page.html").stat().st_size < 5e6, True, "5 MB for 10,000 buckets")
    drawn = browser.evaluate("performance.getEntriesByName('drawn')[0].startTime")
    same(drawn < 2000, True, f"{drawn} ms for the first drawing")
    browser.evaluate("window.scrollTo(0, document.body.scrollHeight)")
    browser.settle()
    rows = browser.evaluate("""[...document.querySelectorAll('.strips .row')]
        .map((row) => row.children[0].innerText)""")
    same(("10000" in rows[-1:], len(rows) < 200), (True, True), f"rows in view: {rows}")


half_time, end = Work(116, 3000, names=("</script><b>", "second")).reports
with tempfile.TemporaryDirectory() as folder, Browser(sys.argv[3]) as chromium, chdir(folder):
    test_one(chromium, end)
    test_pair(chromium, half_time, end)
    test_off(chromium)
    test_many(chromium)
    same(chromium.messages, [], "messages in the console")
