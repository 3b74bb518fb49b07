#!/usr/bin/env python3
"""Draws the library's own reports and compares, in a browser, what the page says with their text.

usage: picture_test.py VOKMEMPOOL CHROMIUM
"""
import random
import re
import subprocess
import sys
import tempfile
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "scripts"))
from browser import Browser

PROGRAM, CHROMIUM = sys.argv[1:3]
LOOKS = """pools.map((pool) => pool.buckets.map((bucket) => countLooks(bucket)))"""
LINKS = """pools.map((pool) => pool.buckets.map((bucket) => [...bucket.unpacked.type.keys()]
  .filter((i) => bucket.unpacked.type[i] === Type.free)
  .map((i) => [bucket.offsetOf(i), bucket.unpacked.next[i], bucket.addressOf(i)])))"""
TIP = "document.getElementById('tip').innerText"


def work(pools, steps, sizes, share):
    """Trace lines of pools that serve and take back at random; `share` of the steps are requests."""
    lines, live, at = [f"zvpt:c:{pool}" for pool in pools], [], 0x1000
    for _ in range(steps):
        if random.random() < share or not live:
            at += 0x1000
            live.append((random.choice(pools), at))
            lines.append(f"zvpt:a:{live[-1][0]}:{at:x}:{random.choice(sizes)}")
        else:
            i = random.randrange(len(live))
            live[i], live[-1] = live[-1], live[i]
            lines.append("zvpt:f:{}:{:x}:".format(*live.pop()))
    return "\n".join(lines) + "\n"


def report(trace, line, *options):
    """What the library prints of the pools as of a line. The address space is always the same, so
    that two of them may be compared."""
    return subprocess.run(["setarch", "-R", PROGRAM, "trace", "--detailed", "--at", str(line), *options],
                          input=trace, capture_output=True, text=True, check=True).stdout


def picture(folder, *reports):
    files = []
    for i, text in enumerate(reports):
        files.append(folder / f"report-{i}.txt")
        files[-1].write_text(text)
    page = folder / "page.html"
    subprocess.run([PROGRAM, "picture", *files, "-o", page], check=True)
    return page


def read(text):
    """The buckets of a report, pool by pool: address, offsets by type, links and the heads' offset."""
    pools = []
    for pool in re.split(r"^MemPool::Mgr ", text, flags=re.M)[1:]:
        pools.append([])
        for bucket in re.split(r"^   MemPool::Bucket #\d+\n", pool, flags=re.M)[1:]:
            records = re.findall(r"^      \d{5} +(\w+) +(\d+) +\d+ +\d+ +\d+ +0x\w+ $", bucket, re.M)
            pools[-1].append({
                "addr": re.search(r"Addr +: (\w+)", bucket)[1],
                "used": {offset for kind, offset in records if kind == "USED"},
                "free": {offset for kind, offset in records if kind == "FREE"},
                "links": sorted([int(offset), int(next), addr] for offset, next, addr in re.findall(
                    r"^      \d{5} +(\d+) +(\d+) +\d+ +(0x\w+) +\w+ $", bucket, re.M)),
            })
    return pools


def looks(**counts):
    return {**dict.fromkeys(("used", "free", "next", "damaged", "came", "went"), 0), **counts}


def expected_looks(bucket):
    next = 1 if bucket["free"] else 0
    return looks(used=len(bucket["used"]), free=len(bucket["free"]) - next, next=next)


def same(found, expected, what):
    if found != expected:
        sys.exit(f"picture_test: {what}: found {found}, expected {expected}")


def test_one(browser, folder, text):
    """The cells, the links, the keyboard, the pointer and the order."""
    browser.open(picture(folder, text))
    pools = read(text)
    same(browser.evaluate(LOOKS), [[expected_looks(b) for b in pool] for pool in pools], "the cells")
    same(browser.evaluate(LINKS), [[b["links"] for b in pool] for pool in pools], "the links")
    browser.evaluate("document.querySelector('.head button').focus()")
    browser.press(*["Tab"] * 6, "PageUp", "Home", "ArrowRight")  # past the other headings, into the list
    first = pools[0][0]
    size = sorted(map(int, first["used"] | first["free"]))
    tip = browser.evaluate(TIP)
    same(f"offset\n{size[1]} to {size[2]}" in tip and f"record 2 of {len(size)}" in tip, True, tip)
    browser.press("h")
    head = browser.evaluate("pools[0].buckets[0].head")
    same(f"offset\n{head} to" in browser.evaluate(TIP), True, "the key h")
    same("served next" in browser.evaluate("document.getElementById('spoken').innerText"), True,
         "what is said aloud")
    link = next(link for link in first["links"] if link[0] == head)
    browser.press("n")
    same(f"offset\n{link[1]} to" in browser.evaluate(TIP), True, "the key n")
    browser.press("Escape")
    same(browser.evaluate("document.getElementById('tip').hidden"), True, "the key Escape")
    x, y = browser.evaluate("""(() => {
        const box = document.querySelector('.strips canvas').getBoundingClientRect();
        return [box.left + 3, box.top + 10];
    })()""")
    browser.move(1, 1)
    browser.move(x, y)
    same(f"record 1 of {len(size)}" in browser.evaluate(TIP), True, "the pointer")
    browser.move(1, 1)
    same(browser.evaluate("document.getElementById('tip').hidden"), True, "the pointer gone")
    browser.tap(x + 9, y)
    same(f"record 4 of {len(size)}" in browser.evaluate(TIP), True, "a tap")
    browser.evaluate("[...document.querySelector('.head').querySelectorAll('button')][2].focus()")
    browser.press("Enter")
    most = max(len(bucket["used"]) for bucket in pools[0])
    same(browser.evaluate("document.querySelectorAll('.strips .row > span')[2].innerText"), str(most),
         "the bucket with the most used records")


def test_damaged(browser, folder, text):
    """A record whose type byte went wild, and a link that leads nowhere."""
    damaged = re.sub(r"(00001 )(USED|FREE)", r"\1UNKN", text, count=1)
    damaged = re.sub(r"(?<=n=)\d+ *(?=\|)", "9999  ", damaged, count=1)
    browser.open(picture(folder, damaged))
    found = sum(bucket["damaged"] for pool in browser.evaluate(LOOKS) for bucket in pool)
    same(found >= 2, True, f"{found} damaged records")
    browser.evaluate("document.querySelector('.strips').focus()")
    browser.press("PageUp", "Home")
    same("type\nUNKN" in browser.evaluate(TIP), True, browser.evaluate(TIP))
    browser.press("d")
    same("next\n9999, no record" in browser.evaluate(TIP), True, browser.evaluate(TIP))


def test_pair(browser, folder, before, now):
    browser.open(picture(folder, before, now))
    expected = []
    for earlier, later in zip(read(before), read(now)):
        was = {bucket["addr"]: bucket["used"] for bucket in earlier}
        expected.append([sum(len(b["used"] - was.get(b["addr"], set())) for b in later),
                         sum(map(len, was.values())) -
                         sum(len(b["used"] & was.get(b["addr"], set())) for b in later)])
    same(browser.evaluate("pools.map((pool) => [pool.came, pool.went])"), expected, "what changed")
    total = """pools.map((pool) => pool.buckets.map(countLooks).reduce((sum, looks) => sum + looks.came, 0))"""
    same(browser.evaluate(total), [came for came, went in expected], "the cells that came")


def test_many(browser, folder):
    """10,000 buckets, and half of their records given back."""
    trace = "zvpt:c:a0\n" + "".join(f"zvpt:a:a0:{i + 1:x}000:12\n" for i in range(200000))
    trace += "".join(f"zvpt:f:a0:{i + 1:x}000:\n" for i in random.sample(range(200000), 100000))
    page = picture(folder, report(trace, 300001, "--bucket-size", "322", "--max-record-size", "100",
                                  "--keep-empty-buckets"))
    same(page.stat().st_size < 5e6, True, "5 MB for 10,000 buckets")
    browser.open(page)
    same(browser.evaluate("pools[0].buckets.length"), 10000, "buckets")
    same(browser.evaluate("performance.getEntriesByName('drawn')[0].startTime < 2000"), True,
         "2 s for the first drawing")
    browser.evaluate("window.scrollTo(0, document.body.scrollHeight)")
    browser.settle()
    same(browser.evaluate("[...document.querySelectorAll('.strips .row')].pop().children[0].innerText"),
         "10000", "the last bucket")
    same(browser.evaluate("document.querySelectorAll('.strips .row').length < 200"), True,
         "rows in view alone")


def main():
    random.seed(5)
    trace = work(["a0", "b0"], 3000, (9, 12, 24, 40, 100, 900, 1500), .65)
    options = ("--name", "a0=</script><b>", "--name", "b0=second")
    before, now = (report(trace, line, *options) for line in (2000, 3002))
    with tempfile.TemporaryDirectory() as name, Browser(CHROMIUM) as browser:
        folder = Path(name)
        test_one(browser, folder, now)
        test_damaged(browser, folder, now)
        test_pair(browser, folder, before, now)
        test_many(browser, folder)
        same(browser.messages, [], "messages in the console")


main()
