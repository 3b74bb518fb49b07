#!/usr/bin/env python3
"""Records a program that makes known requests, and compares what advise and replay say of it.

usage: record_test.py VOKMEMPOOL POOL_CHILD HEAP_CHILD [CHROMIUM]
"""
import json
import re
import shutil
import signal
import subprocess
import sys
import tempfile
import time
from contextlib import chdir
from pathlib import Path

from browser import Browser
from support import Work, data_of, run, same, tool, POOLS, PROGRAM

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
    ("orphan", 0, [{}, {"Mallocs": [10, "24", 10, 0]}]),
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
BAD_ARGUMENTS = [
    (["record", "-o", "-", "--", "true"],
     "--output: takes a file; standard output is the program's"),
    (["replay", "rec", "--min-record-size", 2000, "--max-record-size", 100],
     "the smallest record is larger than the largest (2000 > 100)"),
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
    for arguments, message in BAD_ARGUMENTS:
        same(run(PROGRAM, *arguments), ("", f"vokmempool: {message}\nusage: vokmempool SUBCOMMAND "
                                        "[OPTIONS] [FILE]\n", 2), arguments)


def test_places():
    """A recorder that is installed under a path with blanks, a recorder in a recorder, a recording
    that is read from a pipe, and no memory for a ring."""
    folder = Path("a folder: own")
    folder.mkdir()
    for file in (PROGRAM, Path(PROGRAM).with_name("libvokmempool-record.so")):
        shutil.copy(file, folder)
    run(folder / "vokmempool", "record", "--", PROGRAM, "record", "-o", "inner", "--", CHILD, "calls")
    whole = tool("advise", "--no-replay", "--json", "inner")
    same(advice("inner")[1]["Mallocs"], CALLS["Mallocs"], "a recorder in a recorder")
    same("vokmempool record" in tool("advise", "--no-replay", "vokmempool.rec"), True, "the outer one")
    given = Path("inner").read_bytes().decode("latin-1")
    same(tool("advise", "--no-replay", "--json", "-", given=given), whole, "standard input")
    same(run("unshare", "-rm", "sh", "-c", f"mount -t tmpfs -o size=4m none /dev/shm; {PROGRAM} "
             f"record -- {CHILD} 3 2>&1")[0].split(" in ")[0],
         "vokmempool: nothing was recorded: the loader ignored the recorder's library, or there was "
         "no memory for its ring", "no memory")


def recording(*entries):
    """A recording with these entries: the kind of each, its numbers, its bytes behind their length."""
    def number(value):
        return bytes([value]) if value < 128 else bytes([value & 127 | 128]) + number(value >> 7)
    plain = b"".join(number(part) if isinstance(part, int) else number(len(part)) + part
                     for entry in entries for part in entry)
    size = len(plain).to_bytes(4, "little")
    frame = b"\x28\xb5\x2f\xfd\xa0" + size + (len(plain) << 3 | 1).to_bytes(3, "little") + plain
    return b"VOKMPREC\1\0\0\0" + len(frame).to_bytes(4, "little") + size + frame


def test_entries():
    """A stack between the modules of a list, a block that no pool serves, and a last sample."""
    unload, malloc, stack, module, end = 5, 16, 6, 4, 0
    modules = [(CHILD, 1 << 40), (POOLS, 2 << 40)]
    starts = [int.from_bytes(Path(path).read_bytes()[24:32], "little") + at + 1 for path, at in modules]
    Path("made").write_bytes(recording(
        [unload], [module, modules[0][1], CHILD.encode()], [stack, 1, 2 * starts[0]],
        [module, modules[1][1], POOLS.encode()], [stack, 1, 2 * starts[1]],
        [malloc, 5 << 30, 1], *[[malloc, 24, 2]] * 796, [end, 797, 0]))
    found = json.loads(tool("advise", "--rounds", 2, "--json", "made"))
    same([(site["where"], site["requests"]) for site in found["sites"]], [("_start+0x1", 797)],
         "the modules")
    same(found["samples"][-1]["event"], 797, "the last sample")
    same(found["replay"]["last"], 797, "what was replayed")


def test_interrupt():
    """A recording ends by a signal once the program has ended; the replays end by one, and leave
    nothing behind."""
    left = subprocess.Popen([PROGRAM, "record", "-o", "left", "--", "sh", "-c", "(sleep 30 &); exit 3"],
                            stderr=subprocess.DEVNULL)
    while not Path("left").exists():
        time.sleep(.01)
    for _ in range(20):
        time.sleep(.3)
        left.send_signal(signal.SIGINT)
        if left.poll() is not None:
            break
    same(left.returncode, 3, "a recording that a process of the program outlives")
    def files():
        return set(Path("/dev/shm").glob("vokmempool.*"))
    before = files()
    advise = subprocess.Popen([PROGRAM, "advise", "--rounds", "1000", "--run", "--", CHILD, "keep"],
                              stderr=subprocess.PIPE)
    advise.stderr.readline()
    while files() - before:
        time.sleep(.01)
    advise.send_signal(signal.SIGINT)
    same(advise.wait(10), -signal.SIGINT, "interrupted replays")
    same(files() - before, set(), "what is left")


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
    test_places()
    test_entries()
    test_interrupt()
    test_advice()
    test_replay()
    if len(sys.argv) > 4:
        with Browser(sys.argv[4]) as chromium:
            test_page(chromium)
