#!/usr/bin/env python3
"""The commands of gdb against what the process itself reports: attached, with a core file, and with
damaged links; and the pools and adaptors as values.

usage: gdb_test.py VOKMEMPOOL POOL_CHILD ADAPTORS_CHILD
"""
import json
import os
import random
import re
import signal
import subprocess
import sys
import tempfile
from pathlib import Path

from support import POOLS, run, same, tool

SCRIPT = Path(__file__).resolve().parents[2] / "tools/gdb/libVokMemPool-gdb.py"


def script(draw):
    calls, blocks = [], 0
    for name, settings in ("two words", "bucket=130 align=4 max=96"), ("b", "bucket=4010 max=1000"):
        calls += [f"set {settings} on=1", f"pool {name}"]
        mine = []
        for _ in range(150):
            if draw.random() < .7 or not mine:
                calls.append(f"alloc {draw.choice((draw.randrange(90), draw.randrange(3000)))}")
                mine.append(blocks)
                blocks += 1
            else:
                calls.append(f"free {mine.pop(draw.randrange(len(mine)))}")
    return ";".join(calls + ["set on=0", "pool off", "say @", "report", "stop"])


def debug(*arguments, commands):
    words = [word for command in ("set width 0", f"source {SCRIPT}", *commands)
             for word in ("-ex", command)]
    output, errors, _ = run("gdb", "-nx", "-batch", *arguments, *words)
    same("Python" in output + errors, False, output + errors)
    return output, errors


def held(report):
    """What a pool holds, as the list shows it."""
    buckets = sum(report["header"]["sizeofBucket"] + row["total"] * row["recSize"]
                  for row in report["buckets"]["rows"])
    exts = sum(int(row["data"], 16) - int(row["heap"], 16) + row["length"]
               for row in report["extRecs"]["rows"])
    return buckets + exts


def expected_of(report):
    """For an address in each record its first line."""
    for bucket in report["bucketReports"]:
        rows = bucket["records"]["rows"]
        for row in rows:
            address = int(row["addr"], 16) + 4  # after the header
            yield address + 1, (f"{address + 1:#x}: byte 1 of record {row['id']} of {len(rows)} at "
                                f"{address:#x}, {row['type'].lower()}")
    for row in report["extRecs"]["rows"]:
        address = int(row["data"], 16)
        yield address, f"{address:#x}: byte 0 of the ext record at {address:#x}, used, {row['length']} bytes"


def test_reports(reports, *arguments):
    places = [place for report in reports for place in expected_of(report)][::11]
    output, _ = debug(*arguments, commands=[
        "mempool list", "echo @\\n", "mempool report b", "echo @\\n",
        *(f"mempool of {address}" for address, _ in places)])
    listed, classes, of = output[output.index("pool  "):].split("@\n")
    rows = [tuple(re.split("  +", line)) for line in listed.splitlines()[1:]]
    same(rows, [(report["name"] + (" (off)" if report["header"]["enabled"] == 0 else ""),
                 *(str(report["header"][key]) for key in ("usedRecs", "freeRecs", "extRecs",
                                                          "numBuckets")), str(held(report)))
                for report in reports], "the list")
    sizes = [[int(word) for word in line.split()] for line in classes.splitlines()[1:-1]]
    b = next(report["header"] for report in reports if report["name"] == "b")
    same([sum(column) for column in list(zip(*sizes))[1:]],
         [b["usedRecs"], b["freeRecs"], b["numBuckets"], b["empty"], b["full"]], "the size classes")
    same([line for line in of.splitlines() if line.startswith("0x")], [line for _, line in places],
         "what is at the addresses")


def test_damage(reports, pid):
    """Of a running process, last."""
    bucket = next(report["bucketReports"][0] for report in reports if report["bucketReports"])
    address = int(bucket["header"]["addr"], 16)
    found = "".join(debug("-p", pid, commands=[
        "mempool of 0", "mempool of", "mempool of missing", "mempool report", "mempool report none",
        f"set {{long}}{address + 8} = 1", "mempool list", f"set {{long}}{address + 8} = {address}",
        "mempool of 0", "python at = Layout(); first = at.fetch('entry', at.read_pointer(at.first))",
        "python gdb.execute(f'set {{long}}{first.address + first.fields[\"next\"]} = 2')", "mempool list"]))
    for text in ("0x0: in no pool", "usage: mempool of ADDRESS", "usage: mempool report NAME",
                 'mempool: No symbol "missing" in current context.', "mempool: there is no pool 'none'",
                 "pool 'b': a link leads to 0x1", f"pool 'b': a link leads to {address:#x}",
                 "the list of pools: a link leads to 0x2"):
        same(f"{text}\n" in found, True, f"{text}: {found}")


def test_values():
    output, _ = debug(sys.argv[3], commands=["run", "info locals"])
    words = "Mgr", "Mgr", "Allocator<int>", "Resource", "Deleter<Marked>", "Deleter<int []>"
    threads = "ThreadPools", "ThreadAllocator<int>", "ThreadResource"
    same(re.findall(" = (.* of .*)", output),
         [f"{kind} of 'words'" for kind in words] + [f"{kind} of 'threads'" for kind in threads], output)


test_values()
with tempfile.TemporaryDirectory() as folder:
    os.chdir(folder)
    with open("output", "wb") as output:
        child = subprocess.Popen([POOLS, script(random.Random(2))], stdout=output)
    os.waitpid(child.pid, os.WUNTRACED)
    own = json.loads(tool("report", "--json", given=Path("output").read_text().split("@\n")[1]))["reports"]
    try:
        test_reports(own, "-p", child.pid)
        run("gcore", "-o", "core", child.pid)
        test_reports(own, POOLS, f"core.{child.pid}")
        test_damage(own, child.pid)
    finally:
        child.send_signal(signal.SIGKILL)
