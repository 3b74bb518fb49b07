"""What the tests of vokmempool share: it started, pools at work, and what a report says of them."""
import json
import os
import random
import re
import subprocess
import sys
from itertools import count
from pathlib import Path

sys.path.append(str(Path(__file__).resolve().parents[1]))
from masking import masked  # for the tests

PROGRAM, POOLS = sys.argv[1:3]


def same(found, expected, what):
    if found != expected:
        sys.exit(f"{sys.argv[0]}: {what}: found\n{found!r}, expected\n{expected!r}")


def run(*command, given="", keys=None):
    """Output, error stream and status of a program. All bytes count, so each is a character."""
    done = subprocess.run([str(word).encode("latin-1") for word in command], capture_output=True,
                          input=given.encode("latin-1"), env={**os.environ, **(keys or {})})
    return done.stdout.decode("latin-1"), done.stderr.decode("latin-1"), done.returncode


def tool(*arguments, given="", keys=None):
    """The output of vokmempool, which ends well."""
    output, errors, status = run(PROGRAM, *arguments, given=given, keys=keys)
    same(status, 0, f"{arguments}: {errors}")
    return output


def random_calls(draw, steps, clears, names, settings):
    """Calls of the child program on two pools, which it prints in detail after each half of the
    steps. The first one is also asked to free a block of the other."""
    largest, blocks = settings["MAX_RECORD_SIZE"], count(1)
    calls = [f"pool {name}" for name in names] + ["alloc 1"]
    pools = [(name, []) for name in names]
    for step in range(1, steps + 1):
        if draw.random() < .5:
            pools.reverse()
            calls.append("turn")
        name, held = pools[-1]
        if not held or draw.random() < .6:
            end = 2 * largest if draw.random() < .1 else largest // 3 + 1
            calls.append(f"alloc {draw.randrange(1, end)}")
            held.append(next(blocks))
        else:
            calls.append(f"free {held.pop(draw.randrange(len(held)))}")
        if settings["ON"] and name == names[0]:  # the heap takes no misuse
            if draw.random() < .05:
                calls.append("free 0")
            if draw.randrange(steps) < clears:  # proved where both requests get one address
                calls += ["alloc 1", "clear", "alloc 1"]
                held[:] = [next(blocks), next(blocks)][1:]
        if step in (steps // 2, steps):
            calls.append("report")
    return calls + ["drop", "drop"]


class Work:
    """Two pools at random work under random settings: the program's output, and in it the trace
    lines and reports in detail of half time and of the end, which `trace` leads to."""

    def __init__(self, seed, steps, clears=0, names=("first", "second"), off=0):
        draw = random.Random(seed)
        alignment, smallest = draw.choice((1, 2, 3, 4, 4, 4, 8, 16)), draw.randrange(4, 44)
        largest = smallest + 2 * alignment + draw.randrange(200)
        settings = {
            "ON": 1 - off, "DATA_ALIGNMENT": alignment, "MIN_RECORD_SIZE": smallest,
            "MAX_RECORD_SIZE": largest, "BUCKET_SIZE": largest + 4 + draw.randrange(1500),
            "KEEP_EMPTY_BUCKETS": draw.randrange(2), "TRACE": 1}
        self.keys = {f"ZOR_VOK_MEMPOOL_{key}": str(value) for key, value in settings.items()}
        calls = ";".join(random_calls(draw, steps, clears, names, settings))
        self.output, errors, status = run("setarch", "-R", POOLS, calls, keys=self.keys)
        same((errors, status), ("", 0), f"the pools of seed {seed}")
        titles = [found.start() for found in re.finditer("^MemPool::Mgr ", self.output, re.M)]
        self.trace = self.output[:titles[2]]
        self.reports = [re.sub("^(zvpt:.*|freed|refused)\n", "", text, flags=re.M)
                        for text in (self.trace, self.output[titles[2]:])]


def data_of(text):
    """The reports of a text, which makes the way to JSON and back unchanged."""
    same(tool("report", "--text", given=text), text, "the reports by themselves")
    document = tool("report", "--json", given=text)
    same(tool("report", "--from-json", "--text", given=document), text, "the reports by JSON")
    return json.loads(document)["reports"]
