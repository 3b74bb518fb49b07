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

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "scripts"))
from browser import Browser
from support import Work, data_of, same, tool

LOOKS = "pools.map((pool) => pool.buckets.map((bucket) => countLooks(bucket)))"
LINKS = """pools.map((pool) => pool.buckets.map((bucket) => [...bucket.unpacked.type.keys()]
  .filter((i) => bucket.unpacked.type[i] === Type.free)
  .map((i) => [bucket.offsetOf(i), bucket.unpacked.next[i], bucket.addressOf(i)])))"""
CHANGES = """pools.map((pool) => [pool.came, pool.went,
  pool.buckets.map(countLooks).reduce((sum, looks) => sum + looks.came, 0)])"""
CORNER = """(() => {
  const box = document.querySelector('.strips canvas').getBoundingClientRect();
  return [box.left + 3, box.top + 10];
})()"""


def draw(browser, *reports):
    files = ["before.txt", "now.txt"][-len(reports):]
    for file, text in zip(files, reports):
        Path(file).write_text(text)
    tool("picture", *files, "-o", "page.html")
    browser.open("page.html")


def used_in(bucket):
    return {row["offset"] for row in bucket["records"]["rows"] if row["type"] == "USED"}


def looks_of(bucket):
    used, rows = len(used_in(bucket)), len(bucket["records"]["rows"])
    served_next = min(rows - used, 1)
    free = rows - used - served_next
    return dict(used=used, free=free, next=served_next, damaged=0, came=0, went=0)


def test_one(browser, text):
    """The cells, the links, the keyboard, the pointer and the order."""
    draw(browser, text)
    pools = [pool["bucketReports"] for pool in data_of(text)]
    same(browser.evaluate(LOOKS), [list(map(looks_of, pool)) for pool in pools], "the cells")
    links = [[sorted([row[key] for key in ("offset", "next", "addr")]
                     for row in bucket["freeList"]["rows"]) for bucket in pool] for pool in pools]
    same(browser.evaluate(LINKS), links, "the links")

    def tip_has(part, *keys):
        browser.press(*keys)
        tip = browser.evaluate("(tip.element.hidden ? 'hidden' : '') + tip.element.innerText")
        same(part in tip, True, f"{keys}: {tip!r} lacks {part!r}")

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
    x, y = browser.evaluate(CORNER)
    for move, part in ((lambda: browser.move(1, 1), "hidden"),
                       (lambda: browser.move(x, y), f"record 1 of {len(rows)}\n"),
                       (lambda: browser.move(1, 1), "hidden"),
                       (lambda: browser.tap(x + 12, y), f"record 4 of {len(rows)}\n")):
        move()
        tip_has(part)
    browser.evaluate("document.querySelector('.head').querySelectorAll('button')[2].focus()")
    browser.press("Enter")
    same(browser.evaluate("document.querySelectorAll('.strips .row > span')[2].innerText"),
         str(max(len(used_in(bucket)) for bucket in pools[0])), "the most used bucket in front")

    # A record whose type byte went wild, and a link that leads nowhere.
    damaged = re.sub(r"(00001 )(USED|FREE)", r"\1UNKN", text, count=1)
    draw(browser, re.sub(r"(?<=n=)\d+ *(?=\|)", "9999  ", damaged, count=1))
    found = sum(bucket["damaged"] for pool in browser.evaluate(LOOKS) for bucket in pool)
    same(found >= 2, True, f"{found} damaged records")
    browser.evaluate("document.querySelector('.strips').focus()")
    tip_has("type\nUNKN", "PageUp", "Home")
    tip_has("next\n9999, no record", "d")


def test_pair(browser, before, now):
    draw(browser, before, now)
    held = [[{(bucket["header"]["addr"], bucket["header"]["recSize"], offset)
              for bucket in pool["bucketReports"] for offset in used_in(bucket)}
             for pool in data_of(text)] for text in (before, now)]
    same(browser.evaluate(CHANGES), [[len(later - earlier), len(earlier - later),
                                      len(later - earlier)] for earlier, later in zip(*held)],
         "what came and went, and the cells that came")


def test_many(browser):
    """10,000 buckets, and half of their records given back."""
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


def main():
    before, now = Work(116, 3000, names=("</script><b>", "second")).reports
    with tempfile.TemporaryDirectory() as folder, Browser(sys.argv[3]) as browser, chdir(folder):
        test_one(browser, now)
        test_pair(browser, before, now)
        test_many(browser)
        same(browser.messages, [], "messages in the console")


main()
