#!/usr/bin/env python3
"""Compares what `vokmempool advise` foretells with what the programs of this folder then take.

usage: compare.py BUILD [ROUNDS]   (a build of the preset release, after `ninja advised`)

Each program is recorded and advised, then it and its changed form run in turn for ROUNDS rounds (20
by default). A row has both differences, as a share of the program's time before, with intervals of
95%, and the heap at the peak. Times are the processor's. What is foretold is a share of the times of
runs around the advice, since a machine isn't always as fast. The changed form gets the settings of
the advice from the environment.
"""
import glob
import json
import math
import os
import re
import resource
import statistics
import subprocess
import sys
import tempfile

# The documents of this project; word-index says its whole resident set at the peak.
INDEXED = ["--repeat", "20", *sorted(glob.glob(f"{os.path.dirname(__file__)}/../../docs/*.md"))]
# Name, what is run before and after, relative to the build's folder of examples.
PROGRAMS = [
    ("graph", ["advised/graph-before"], ["advised/graph-after"]),
    ("queue, 1,000 sizes", ["advised/queue-before", "1000"], ["advised/queue-after", "1000"]),
    ("queue, 400 sizes", ["advised/queue-before", "400"], ["advised/queue-after", "400"]),
    ("frames", ["advised/frames-before"], ["advised/frames-after"]),
    ("word-index", ["word-index", "--heap", *INDEXED], ["word-index", *INDEXED]),
]
FACTOR = 2.09  # Student's, for 95% and 20 rounds


def run(command, keys=()):
    """Seconds of the processor, and the heap that the program says in KiB."""
    before = resource.getrusage(resource.RUSAGE_CHILDREN)
    done = subprocess.run(command, check=True, capture_output=True, text=True,
                          env={**os.environ, **dict(key.split("=") for key in keys)})
    after = resource.getrusage(resource.RUSAGE_CHILDREN)
    heap = re.search(r"heap (\d+) KiB|resident set in KiB: (\d+)", done.stderr + done.stdout)
    return (after.ru_utime - before.ru_utime + after.ru_stime - before.ru_stime,
            int(heap.group(1) or heap.group(2)))


def interval(values):
    half = FACTOR * statistics.stdev(values) / math.sqrt(len(values))
    mean = statistics.mean(values)
    return mean, mean - half, mean + half


def percent(values, whole):
    return "{:+.1f}% [{:+.1f}, {:+.1f}]".format(*(100 * value / whole for value in values))


def advise(tool, command, folder):
    recording = os.path.join(folder, "recording")
    subprocess.run([tool, "record", "-o", recording, "--", *command], check=True,
                   capture_output=True)
    return json.loads(subprocess.run([tool, "advise", "--json", recording], check=True,
                                     capture_output=True).stdout)["replay"]


def main():
    if not 2 <= len(sys.argv) <= 3:
        print("usage: compare.py BUILD [ROUNDS]", file=sys.stderr)
        return 2
    build, rounds = sys.argv[1], int(sys.argv[2]) if len(sys.argv) > 2 else 20
    print("| Program | Advice | Foretold | Measured | KiB foretold | KiB measured |")
    print("|---|---|--:|--:|--:|--:|")
    for name, *commands in PROGRAMS:
        before, after = [[f"{build}/examples/{command[0]}", *command[1:]] for command in commands]
        around = [run(before)[0] for _ in range(rounds // 2)]
        with tempfile.TemporaryDirectory() as folder:
            replay = advise(f"{build}/tools/vokmempool", before, folder)
        around += [run(before)[0] for _ in range(rounds // 2)]
        best = replay["best"]
        pairs = [(run(before), run(after, best["keys"].split())) for _ in range(rounds)]
        whole = statistics.mean(pair[0][0] for pair in pairs)
        measured = interval([two[0] - one[0] for one, two in pairs])
        foretold = [replay["forecast"][key] for key in ("mean", "low", "high")]
        answer = best["name"] if replay["pays"] else f"don't; best: {best['name']}"
        print(f"| {name} | {answer} | {percent(foretold, statistics.mean(around))} | {percent(measured, whole)} "
              f"| {replay['heap']['bytes'] // 1024}, {best['bytes'] // 1024} "
              f"| {pairs[-1][0][1]}, {pairs[-1][1][1]} |", flush=True)
    return 0


if __name__ == "__main__":
    sys.exit(main())
