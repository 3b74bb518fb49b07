#!/usr/bin/env python3
"""vokmempool top in a terminal, and its rounds against what the process itself reports.

usage: top_test.py VOKMEMPOOL POOL_CHILD
"""
import os
import re
import signal
import subprocess
import sys
import tempfile
import time
from pathlib import Path

from support import POOLS, PROGRAM, run, same, tool

SCRIPT = ("set on=1;pool b;build 3;pool a;alloc 5000;build 10;pool empty;say @;report;stop;"
          "build 7;stop")
TMUX = ("tmux", "-L", f"vok{os.getpid()}")


def screen(until):
    """The screen as soon as it has the text."""
    for _ in range(100):
        text = run(*TMUX, "capture-pane", "-p")[0]
        if until in text:
            return text
        time.sleep(.1)
    sys.exit(f"the screen has no {until!r}:\n{text}")


def rows_of(text):
    """Held bytes, growth and buckets by pool."""
    rows = re.findall(r"^(\w+) +(\d+) +([+-]\d+) +[+-]\d+ +\d+ +(\d+) *$", text, re.M)
    return {name: tuple(map(int, numbers)) for name, *numbers in rows}


def expected(report):
    rows = [re.split("  +", line) for line in tool("report", given=report).splitlines()[1:]]
    buckets = re.findall("Num Buckets : *(\\d+)", report)
    return {row[0]: (int(row[4]), 0, int(number)) for row, number in zip(rows, buckets)}


with tempfile.TemporaryDirectory() as folder:
    os.chdir(folder)
    with open("output", "wb") as output:
        child = subprocess.Popen([POOLS, SCRIPT], stdout=output)
    os.waitpid(child.pid, os.WUNTRACED)
    own = expected(Path("output").read_text().split("@\n")[1])
    try:
        rounds = tool("top", "--batch", 2, "--every", .05, child.pid).split("process ")[1:]
        same([rows_of(text) for text in rounds], [own, own], "two rounds")
        same(list(rows_of(rounds[0])), ["a", "b", "empty"], "by bytes held")
        same(run(PROGRAM, "top", child.pid)[1:],
             (f"vokmempool: {child.pid}: standard output is no terminal; --batch N prints rounds\n", 1),
             "no terminal")
        same(run(PROGRAM, "top", "1x")[1].splitlines()[0],
             "vokmempool: PID: takes the number of a process, from 1 to 2147483647, and not 1x", "1x")
        run(*TMUX, "new-session", "-d", "-x", 100, "-y", 12, f"{PROGRAM} top --every .1 {child.pid}")
        same(rows_of(screen("a ")), own, "the screen")
        child.send_signal(signal.SIGCONT)
        os.waitpid(child.pid, os.WUNTRACED)
        grown = own["b"][0] // 3 * 7
        same(rows_of(screen(f"+{grown}"))["empty"], (grown, grown, 7), "a pool that has grown")
        run(*TMUX, "send-keys", "n", "Home", "Down", "Enter")
        same("         996           12            0            3" in screen("record size"), True,
             f"the size classes of b: {screen('')}")
        run(*TMUX, "send-keys", "Escape")
        same(list(rows_of(screen("since start"))), ["a", "b", "empty"], "by name")
        run(*TMUX, "send-keys", "q")
        while run(*TMUX, "has-session")[2] == 0:
            time.sleep(.1)
    finally:
        child.kill()
        run(*TMUX, "kill-server")
