#!/usr/bin/env python3
"""vokmempool inspect against what the process itself reports: running, as core files of the kernel, of
gcore and of an emulator, and with damaged bytes.

usage: inspect_test.py VOKMEMPOOL POOL_CHILD [EMULATOR...]

An emulated process has core files alone. VOK_MEMPOOL_APPROVE in the environment writes the corpus of
fuzz/core_fuzz.cpp again.
"""
import json
import os
import random
import re
import resource
import signal
import struct
import subprocess
import sys
import tempfile
import time
from itertools import accumulate, count
from pathlib import Path

from support import POOLS, PROGRAM, run, same, tool

EMULATOR = sys.argv[3:]
CORPUS = Path(__file__).resolve().parents[2] / "fuzz/corpus/core"
WIDTH = 4 if EMULATOR else 8


def script(draw, states):
    """Calls on three pools, two of them with size classes of few records, and so many states."""
    calls, held = [], {}
    for name in draw.sample(["", "two\nlines", "cache", "d"], 3):
        calls += ["set bucket={} align={} max={} keep={} on={}".format(
            *draw.choice(((130, 4, 96), (4010, 8, 1000), (700, 3, 40))), draw.randrange(2),
            int(name != "d")), f"pool {name}"]
        held[name] = []
    names, blocks = list(held), count()
    for _ in range(states):
        for _ in range(draw.randrange(1, 80)):
            name, act = names[-1], draw.random()
            if act < .2:
                names.reverse()
                calls.append("turn")
            elif act < .7 or not held[name]:
                held[name].append(next(blocks))
                calls.append(f"alloc {draw.choice((draw.randrange(1, 100), draw.randrange(1, 3000)))}")
            elif act < .98 or name == "d":
                calls.append(f"free {held[name].pop(draw.randrange(len(held[name])))}")
            else:
                held[name].clear()
                calls.append(draw.choice(("clear", "reset")))
        calls += ["say @", "report", "say @", "core", "stop"]
    return ";".join(calls)


class Child:
    """A process that does a script, and its own last report at each state."""

    def __init__(self, calls):
        resource.setrlimit(resource.RLIMIT_CORE, (resource.RLIM_INFINITY,) * 2)
        self.output = open("output", "w+b")
        self.process = subprocess.Popen([*EMULATOR, POOLS, calls], stdout=self.output)

    def states(self):
        while os.WIFSTOPPED(os.waitpid(self.process.pid, os.WUNTRACED)[1]):
            yield self.process.pid, Path("output").read_text("latin-1").split("@\n")[-2]
            os.kill(self.process.pid, signal.SIGCONT)


def take_core(pid):
    """The core file of the state; gcore writes it where the kernel sends its own elsewhere."""
    cores = [path for path in Path().glob("*core*") if not EMULATOR or path.suffix == ".core"]
    if not cores and not EMULATOR:
        run("gcore", "-o", "gcore", pid)
        cores = list(Path().glob("gcore.*"))
    same(len(cores), 1, "core files")
    return cores[0].rename("taken")


def test_states(processes):
    for seed in range(processes):
        for number, (pid, own) in enumerate(Child(script(random.Random(seed), 10)).states()):
            core = take_core(pid)
            same(tool("inspect", "--text", core), own, f"seed {seed}, state {number}: the core")
            same(tool("inspect", "--check", core), "3 reports, no contradiction\n", f"seed {seed}, state {number}: the check")
            for path in Path().glob("*core*"):
                path.unlink()
            if EMULATOR:
                continue
            same(tool("inspect", "--text", pid), own, f"seed {seed}, state {number}: the process")
            if number > 0:
                continue
            same(tool("inspect", "--json", "--stop", pid), tool("report", "--json", given=own), "json")
            same(tool("inspect", pid), tool("report", given=own), "summary")
            run("gcore", "-o", "gcore", pid)
            same(tool("inspect", "--text", f"gcore.{pid}"), own, "the core of gcore")
            Path(f"gcore.{pid}").unlink()


def test_moving():
    """A process at work: nothing is damaged, something moves, and it goes on."""
    child = Child("set on=1;pool a;" + "build 2000;clear;" * 7000)
    found, end = "", time.monotonic() + 5
    while child.process.poll() is None and time.monotonic() < end:
        for option in (), ("--stop",):
            output, errors, _ = run(PROGRAM, "inspect", *option, child.process.pid)
            found += "" if option else output + errors
    same(child.process.poll() in (None, 0), True, "the process at work")
    same((" damaged" in found, " moving\n" in found), (False, True), found)
    child.process.kill()


def test_every():
    """Round after round, until the process ends."""
    child = Child("set on=1;pool a;alloc 9;stop")
    os.waitpid(child.process.pid, os.WUNTRACED)
    watcher = subprocess.Popen([PROGRAM, "inspect", "--every", ".02", str(child.process.pid)],
                               stdout=subprocess.PIPE, text=True)
    rounds = [watcher.stdout.readline().split()[0] for _ in range(6)]
    child.process.kill()
    same((rounds, watcher.wait()), (["pool", "a"] * 3, 0), "rounds")


class Core:
    """The pieces of a core file's memory that the pools are in."""

    def __init__(self, path):
        self.bytes = Path(path).read_bytes()
        fields = ("<Q", "<QQIHHH", 32, "<IIQQQQ", (2, 3, 5)) if WIDTH == 8 else (
            "<I", "<IIIHHH", 28, "<IIIIII", (1, 2, 4))
        self.word, header, at, segment, (offset, address, size) = fields
        first, _, _, _, each, number = struct.unpack_from(header, self.bytes, at)
        segments = [struct.unpack_from(segment, self.bytes, first + i * each) for i in range(number)]
        self.segments = [(s[address], s[size], s[offset]) for s in segments if s[0] == 1]
        self.words = {}  # the address of each word, to the pool that owns it
        self.add_registry()

    def read(self, address, size):
        for begin, length, offset in self.segments:
            if begin <= address < begin + length:
                return self.bytes[offset + address - begin:][:size]
        return b""

    def pointer(self, address):
        return struct.unpack(self.word, self.read(address, WIDTH))[0]

    def add(self, address, size, owner):
        self.words.update((word, owner) for word in range(address & -WIDTH, address + size, WIDTH))
        return address

    def add_registry(self):
        layout = next(begin + found.start() for begin, size, offset in self.segments
                      for found in re.finditer(b"VokMemPoolLayout\0", self.bytes[offset:offset + size])
                      if self.pointer(begin + found.start() + 32) == begin + found.start())
        fields = struct.unpack("<52I", self.read(layout + 32 + 2 * WIDTH, 4 * 52))
        self.add(layout, 32 + 2 * WIDTH + 4 * 52 + 64, None)
        at = self.pointer(self.add(self.pointer(layout + 32 + WIDTH), WIDTH, None))
        while at:
            name, pool, at = (self.pointer(self.add(at, fields[3], None) + k * WIDTH) for k in range(3))
            self.add(name & -64, 128, None)
            self.add(pool, fields[16], pool)
            table = self.pointer(pool + fields[7])
            number, = struct.unpack("<I", self.read(pool + fields[9], 4))
            self.add(table, number * WIDTH, pool)
            self.add(self.pointer(pool + fields[6]), fields[5], pool)
            for group in filter(None, (self.pointer(table + i * WIDTH) for i in range(number))):
                self.add(group, fields[23], pool)

    def add_pools(self, reports):
        for report in reports:
            pool = int(report["header"]["addr"], 16)
            for bucket in report["bucketReports"]:
                begin, end = (int(bucket["header"][key], 16) for key in ("addr", "recsEnd"))
                self.add(begin, end - begin, pool)
            for row in report["extRecs"]["rows"]:
                self.add(int(row["heap"], 16), int(row["data"], 16) - int(row["heap"], 16), pool)

    def shrink(self):
        """A core file of the pieces alone, and the place of each with its owner."""
        starts = [word for word, owner in sorted(self.words.items())
                  if self.words.get(word - WIDTH, 0) != owner]
        owners = [self.words[start] for start in starts]
        sizes = [next(size for size in count(WIDTH, WIDTH) if self.words.get(start + size, 0) != owner)
                 for start, owner in zip(starts, owners)]
        header, each = (64, 56) if WIDTH == 8 else (52, 32)
        places = list(accumulate(sizes, initial=header + each * len(sizes)))
        made = bytearray(self.bytes[:header])
        struct.pack_into(self.word, made, 32 if WIDTH == 8 else 28, header)
        struct.pack_into("<H", made, 56 if WIDTH == 8 else 44, len(sizes))
        for address, size, place in zip(starts, sizes, places):
            made += (struct.pack("<IIQQQQQQ", 1, 6, place, address, 0, size, size, 1) if WIDTH == 8 else
                     struct.pack("<8I", 1, place, address, 0, size, size, 6, 1))
        for address, size in zip(starts, sizes):
            made += self.read(address, size).ljust(size, b"\0")
        return bytes(made), list(zip(places, sizes, owners))


def test_damages(numbers):
    """Bytes flipped in one pool, or anywhere: the program ends, and shows the other pools whole."""
    calls = "set bucket=130 max=24 on=1;" + "".join(
        f"pool {name};" + "alloc 9;alloc 20;" * 4 + "alloc 99;alloc 100;free %d;" % (10 * i)
        for i, name in enumerate("abc")) + "say @;report;say @;core;stop"
    (pid, own), *_ = [(state, take_core(state[0]))[0] for state in Child(calls).states()]
    data = json.loads(tool("report", "--json", given=own))["reports"]
    core = Core("taken")
    core.add_pools(data)
    whole, places = core.shrink()
    Path("small").write_bytes(whole)
    same(tool("inspect", "--text", "small"), own, f"the core of its pieces, {pid}")
    if "VOK_MEMPOOL_APPROVE" in os.environ:
        CORPUS.mkdir(exist_ok=True)
        (CORPUS / f"pools-{8 * WIDTH}").write_bytes(whole)
    texts = {int(report["header"]["addr"], 16): tool(
        "report", "--from-json", "--text", given=json.dumps({"reports": [report]})) for report in data}
    draw = random.Random(1)
    for number in range(numbers):
        victim = draw.choice([*texts, None, None])
        damaged = bytearray(whole)
        for _ in range(draw.choice((1, 1, 3, 20))):
            place, size, _ = draw.choice([p for p in places if p[2] == victim])
            damaged[place + draw.randrange(size)] ^= draw.choice((1, 128, 255, draw.randrange(1, 256)))
        Path("damaged").write_bytes(damaged if number % 50 else whole[:draw.randrange(len(whole))])
        for form in "--check", "--text":
            output, errors, status = run("timeout", 10, PROGRAM, "inspect", form, "damaged")
            same((status in (0, 1), errors.count("\n")), (True, status), f"damage {number}: {errors}")
        if victim is not None and number % 50:
            same([text for owner, text in texts.items() if owner != victim and text not in output],
                 [], f"damage {number}: what the output lacks, {errors}")


def test_commands():
    Path("compressed").write_bytes(b"\x28\xb5\x2f\xfdrest")
    for arguments, status, message in [
            ("", 2, "PID|CORE is required\nusage: *"), ("1 2", 2, "*"),
            ("--stop taken", 2, "--stop: only a process can be stopped\nusage: *"),
            ("--every 1 taken", 2, "--every: only a process changes\nusage: *"),
            ("/no/such", 1, "/no/such: can't be opened: No such file or directory\n"),
            ("compressed", 1, "compressed: it is compressed; decompress it first\n"),
            (PROGRAM, 1, f"{PROGRAM}: it is no core file\n"), ("/", 1, "/: it is no core file\n"),
            ("99999999", 1, "99999999: there is no such process\n"),
            (os.getpid(), 1, f"{os.getpid()}: it has no libVokMemPool 1.1 or later\n")]:
        output, errors, found = run(PROGRAM, "inspect", *str(arguments).split())
        begin, star, _ = message.partition("*")
        whole = f"vokmempool: {begin}"
        same((output, errors.startswith(whole) and (bool(star) or errors == whole), found),
             ("", True, status), errors)
    # A program that lacks a right of the first process, also where root started it.
    lesser = ("setpriv", "--bounding-set=-sys_ptrace") if os.getuid() == 0 else ()
    same(run(*lesser, PROGRAM, "inspect", 1),
         ("", "vokmempool: 1: not permitted; run this as root, or as the process's user with "
              "kernel.yama.ptrace_scope=0\n", 1), "a process of another user")


def main():
    if not Path(PROGRAM).exists():
        print("skipped: the release build has no vokmempool yet")
        sys.exit(77)
    with tempfile.TemporaryDirectory() as folder:
        os.chdir(folder)
        test_states(1 if EMULATOR else 20)
        test_damages(50 if EMULATOR else 500)
        if not EMULATOR:
            test_moving()
            test_every()
            test_commands()


main()
