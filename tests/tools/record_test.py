#!/usr/bin/env python3
"""Records a program that makes known requests, and compares what advise and replay say of it.

usage: record_test.py VOKMEMPOOL POOL_CHILD HEAP_CHILD [CHROMIUM]
"""
import json
import re
import sys
import tempfile
from contextlib import chdir
from pathlib import Path

from browser import Browser
from support import Work, data_of, run, same, tool, PROGRAM

CHILD = sys.argv[3]
# By function: requests, their sizes, releases, live at the end.
CALLS = {"Mallocs": [1000, "24", 1000, 0], "News": [1, "24", 1, 0], "Callocs": [1, "100", 0, 1],
         "Aligned": [1, "100", 0, 1], "Reallocs": [3, "10 to 100,000", 3, 0]}
# Arguments of the child, its status, and what each recording then has of its functions.
RECORDINGS = [
    ("calls 3", 3, [CALLS]),
    ("threads", 0, [{"Threads": [20004, "16 to 40", 20004, 0]}]),
    ("fork calls", 0, [CALLS, {"Mallocs": [10, "24", 10, 0]}]),
    ("exec", 0, [{}, CALLS]),
    ("calls kill", 134, [CALLS]),
]
REFUSALS = [
    (["record", "--", "nosuch"], "nosuch: no such program"),
    (["record", "--", "/sbin/ldconfig"],
     "/sbin/ldconfig: is linked statically, so that no library can be preloaded"),
    (["record", "--", "/usr/bin/passwd"], "/usr/bin/passwd: runs with other rights than the "
     "caller's, so that no library can be preloaded"),
    (["record", "-o", "no/folder", "--", "true"], "no/folder: can't be opened: No such file or "
     "directory"),
    (["advise", "text"], "text: isn't a recording"),
    (["advise", "newer"], "newer: a recording of version 2; this program reads version 1"),
    (["advise", "damaged"], re.compile("damaged: after event 0: a damaged block: .*")),
    (["replay", "text"], "text: is neither a recording nor has it a trace line"),
]


def advice(path):
    """The figures of a recording, and its sites by function; a function may have several lines."""
    found = json.loads(tool("advise", "--no-replay", "--json", path))
    sites = {}
    for site in found["sites"]:
        name = re.search(r"\b(\w+) \(heap_child.cpp:\d+\)$", site["where"])
        if name:
            values = [site[key] for key in ("requests", "sizes", "releases", "liveAtEnd")]
            mine = sites.setdefault(name.group(1), values)
            if mine is not values:
                sizes = sorted((mine[1].split(" to ") + values[1].split(" to ")),
                               key=lambda size: int(size.replace(",", "")))
                sites[name.group(1)] = [mine[0] + values[0], f"{sizes[0]} to {sizes[-1]}",
                                        mine[2] + values[2], mine[3] + values[3]]
    return found, sites


def test_recordings():
    for arguments, status, expected in RECORDINGS:
        output, errors, found = run(PROGRAM, "record", "-o", "rec", "--", CHILD, *arguments.split())
        same((output, found), ("", status), f"{arguments}: {errors}")
        for number, calls in enumerate(expected, 1):
            whole, sites = advice("rec" if number == 1 else f"rec.{number}")
            same((whole["lost"], whole["cut"]), (0, False), f"{arguments}: nothing is lost")
            same({name: sites.get(name) for name in calls}, calls, f"{arguments}: file {number}")
            if arguments == "threads":
                same(whole["threads"], 5, "threads")
                same(sum(site["freedElsewhere"] for site in whole["sites"]
                         if site["sizes"] == "40"), 20000, "blocks of the threads")


def test_cut():
    """The last block goes, and the file still tells what came before."""
    run(PROGRAM, "record", "-o", "rec", "--", CHILD, "threads")
    whole = Path("rec").read_bytes()
    Path("cut").write_bytes(whole[:-1])
    found, _ = advice("cut")
    same(found["cut"], True, "a recording without its end")
    same("it is cut, and read to its last whole block" in tool("advise", "--no-replay", "cut"), True,
         "the text says so")
    Path("text").write_text("no recording\n")
    Path("newer").write_bytes(whole[:8] + b"\2" + whole[9:])
    Path("damaged").write_bytes(whole[:40] + bytes([whole[40] ^ 1]) + whole[41:])


def test_refusals():
    for arguments, message in REFUSALS:
        output, errors, status = run(PROGRAM, *arguments)
        if isinstance(message, str):
            message = re.compile(re.escape(message))
        matches = re.fullmatch("vokmempool: " + message.pattern + "\n", errors) is not None
        same((output, status, matches), ("", 1, True), f"{arguments}: {errors}")


def test_advice():
    """The answer is the machine's; what it rests on isn't."""
    text = tool("advise", "--rounds", 2, "--events", 20000, "rec")
    same(bool(re.match(r"(A pool pays|Don't): ", text)), True, text)
    same(re.findall(r"^  heap +[\d.]+ ms +[\d,]+ KiB$", text, re.M) != [], True, text)
    same("one size, 40 bytes; 100% are freed together, where Reset or Clear serves; "
         "100% are freed by another thread: MemPoolThreads" in text, True, text)
    same(bool(re.search(r"Replayed: events [\d,]+ to [\d,]+, 2 rounds", text)), True, text)
    run(PROGRAM, "record", "-o", "kept", "--", CHILD, "keep")
    kept = json.loads(tool("advise", "--rounds", 2, "--json", "kept"))
    same((kept["threads"], sum(site["bytesAtPeak"] for site in kept["sites"])),
         (1, 24 + 500 * 3990 + 19500 * 24), "a program that ends at its peak")


GAINS = """[...document.querySelectorAll('.gain')].map((row) =>
  [...row.children].map((cell) => cell.textContent).filter((text) => text !== ''))"""
CAPTION = "document.getElementById('caption').innerText"


def test_page(browser):
    """The page says what the text says."""
    text = tool("advise", "rec", "--rounds", 2, "--events", 20000, "--page", "page.html")
    browser.open("page.html")
    same(browser.evaluate("document.querySelector('.answer').innerText"), text.split("\n")[0], "answer")
    rows = [[name, difference or time, size] for name, time, difference, size in re.findall(
        r"^  (\S.*?)  +([\d.]+ ms) +(?:(\S+ ms \[.*?\]) +)?([\d,]+ KiB)$", text, re.M)]
    again, forecast = rows.pop(), re.search("Expected in the program: (.*]),", text).group(1)
    same(browser.evaluate(GAINS), [*rows[:-1], [again[0] + ", again", *again[1:]],
                                   ["expected in the program", forecast]], "the gains")
    page = browser.evaluate("document.getElementById('sites').innerText")
    sites = re.search(r"Call sites, by requests\n(.*?)\n\n", text, re.S).group(1)
    same([line for line in sites.split("\n") if re.sub(r"^ +[\d.]*%? *", "", line) not in page], [],
         "lines of the call sites that the page doesn't have")
    same(browser.evaluate("data.blocks.reduce((sum, block) => sum + block.count, 0) === data.requests"),
         True, "sizes against lifetimes")
    browser.evaluate("document.querySelector('#live svg').focus()")
    browser.press("Home")
    same(browser.evaluate(CAPTION).split("\n")[:2], ["after event 0", "0 bytes"], "the start")
    browser.evaluate("document.querySelector('#blocks svg').focus()")
    browser.press("End")
    same("live at the end" in browser.evaluate("document.getElementById('block').innerText"), True,
         "the last column")
    same(browser.messages, [], "messages in the console")


def records(report):
    return report["header"]["usedRecs"] + report["header"]["extRecs"]


def test_replay():
    """What a report shows at an event is what is live there, of a recording and of a trace."""
    lines = tool("replay", "--rounds", 2, "rec").splitlines()
    same([line.split()[0] for line in lines[1:]], ["heap", "pool"], lines)
    report = data_of(tool("replay", "rec", "--report-at", 1000, "--detailed"))[0]
    live = json.loads(tool("advise", "--no-replay", "--json", "rec"))
    same(0 < records(report) < live["requests"], True, "the pool at an event")
    work = Work(3, 400)
    Path("trace").write_text(work.trace)
    events = [line for line in work.trace.splitlines() if re.match("zvpt:[af]:", line)]
    data = data_of(tool("replay", "trace", "--report-at", len(events)))
    own = data_of(work.reports[1])
    same(sorted(records(one) for one in data),
         sorted(records(one) for one in own), "the pools of a trace")


with tempfile.TemporaryDirectory() as folder, chdir(folder):
    test_recordings()
    test_cut()
    test_refusals()
    test_advice()
    test_replay()
    if len(sys.argv) > 4:
        with Browser(sys.argv[4]) as chromium:
            test_page(chromium)
