#!/usr/bin/env python3
"""Child programs under environment keys: all that each writes and how it ends.

usage: process_test.py FOLDER TABLE... [-- LAUNCHER...]

FOLDER has the programs. TABLE is a pattern of files here; process/environment.txt explains the form.
LAUNCHER starts a program where it doesn't start by itself.
"""
import os
import re
import shutil
import subprocess
import sys
from collections import defaultdict
from pathlib import Path

from masking import first_sights, masked

STRACE = "strace -e trace=brk,mmap -o calls {}../pool_child {{}} && awk '/^brk/ {{{{ n += $NF \"\" " \
         "< last; last = $NF }}}} /mmap.NULL, 325/ {{{{ ++m }}}} END {{{{ print n + 0, \"shrinks,\", " \
         "m + 0, \"maps\" }}}}' calls >&2"
COMMANDS = {
    "memcheck": "exec valgrind -q --num-callers=20 --leak-check=full --error-exitcode=9 ../pool_child {}",
    "asan": "exec ../pool_child_asan {}",
    "strace": STRACE.format(""),
    "trimming": STRACE.format("-E MALLOC_TRIM_THRESHOLD_=131072 "),
    "mimalloc": STRACE.format("-E LD_PRELOAD=libmimalloc.so.2 "),
    "heaptrack": "heaptrack -o trace ../pool_child {} >/dev/null 2>&1 && "
                 "heaptrack_print -l 1 -a 0 -p 0 -T 0 trace.* >&2 2>/dev/null",
}

# The texts that many calls lead to, in short.
SHORT = {
    r"INFO 1: # ={48}\nINFO 2: # ZOR_VOK_MEMPOOL_INFO\nINFO 3: # ={48}\nINFO 4: # Version            : "
    r"\$Id: MemPool,v 1\.2\.52\.4 2009/08/10 21:28:15 qrt Exp \$\n"
    r"INFO 5: # Bucket Size        : (.*)\nINFO 6: # Data Alignment     : (.*)\n"
    r"INFO 7: # Keep Empty Buckets : (.*)\nINFO 8: # Max Record Size    : (.*)\n"
    r"INFO 9: # Min Record Size    : (.*)\nINFO 10: # Trace              : (.*)\n"
    r"INFO 11: # Use Heap           : (.*)": r"banner \1 \2 \3 \4 \5 \6 \7",
    "Duplicate Vok_MemPool::Mgr name encountered ": "duplicate ",
    r"Cannot allocate (.*) bytes, the maximum is 1073741823": r"limit \1",
    "Unexpected condition: the maximum record size is larger than the bucket size ": "maximum ",
    "Unexpected condition: the min rec size is larger than the max rec size ": "minimum ",
    "MIN_RECORD_SIZE >= MAX_RECORD_SIZE ": "",
    "(?m)^ZOR_VOK_MEMPOOL_": "",
}

# What the language's runtime and the emulator say of an abort is not the library's.
FOREIGN = re.compile(r"^(terminate called|qemu: uncaught).*\n", re.M)
# The statuses of an abort, and of an exception that Windows takes itself.
ABORTED = (128 + 6, 3, 0x20474343)


def calls_in(text):
    """The calls, each with its outcome, line by line, and its paragraph."""
    for paragraph in text.split("\n\n"):
        paragraph = re.sub("(?m)^#.*\n?", "", paragraph)
        # A transcript's operations follow one another, and so do their lines.
        if transcript := re.fullmatch("(.*:)\n((?:.+\n?)*)", paragraph):
            operations, lines = zip(*((*line.split("-> "), "")[:2] for line in transcript[2].splitlines()))
            paragraph = f"{transcript[1]} {';'.join(operations)} -> {'; '.join(filter(None, lines))}"
        for line in re.sub("\n +", " ", paragraph).splitlines():
            turns, _, rest = line.replace("ON=*", "ON=0|ON=1").partition(" ")
            for turn in turns.split("|"):
                yield *f"{turn} {rest}".split(" -> "), paragraph


def run(calls, folder, launcher):
    """Makes the calls in one script of the platform's shell, so that an emulated system starts once;
    the output, the error output and the status of each."""
    on_windows = (folder.parent / "pool_child.exe").exists()
    script = ""
    for i, call in enumerate(calls):
        program, keys, operations = re.match(r"(?:(\w+) )?(.*?):(.*)", call).groups("pool_child")
        keys = [key if key.startswith("ZOR") else f"ZOR_VOK_MEMPOOL_{key}" for key in keys.split()]
        if program == "pool_host":  # a client that is unloaded loses its pool
            keys.append("LSAN_OPTIONS=detect_leaks=0")
        if on_windows:
            script += "".join(f"set {key}\n" for key in keys)
            script += f'..\\{program} "{operations}" >{i}.out 2>{i}.err\necho %errorlevel% >{i}.status\n'
            script += "".join(f"set {key.split('=')[0]}=\n" for key in keys)
        else:
            start = " ".join(["exec", *launcher, f"../{program} {{}}"])
            command = COMMANDS.get(program, start).format(f'"{operations}"')
            script += f"(export LC_ALL=C {' '.join(keys)}; {command}) >{i}.out 2>{i}.err\necho $? >{i}.status\n"
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir()
    (folder / "calls.bat").write_text(script)
    env = {key: value for key, value in os.environ.items() if not key.startswith("ZOR_")}
    subprocess.run([*launcher, "cmd", "/c", "calls.bat"] if on_windows else ["sh", "calls.bat"],
                   cwd=folder, env=env, capture_output=True, check=False)
    for i in range(len(calls)):
        yield [(folder / f"{i}.{kind}").read_text() for kind in ("out", "err", "status")]


def lines_of(text, statements):
    text = masked(text, statements)
    for pattern, short in SHORT.items():
        text = re.sub(pattern, short, text)
    return text.splitlines()


def main():
    words = " ".join(sys.argv[2:]).partition(" --")
    tables, launcher = words[0].split(), words[2].split()
    source = Path(__file__).parent
    files = [file for table in tables for file in sorted(source.glob(f"{table}.txt"))]
    calls = [call for file in files for call in calls_in(file.read_text())]
    statements = defaultdict(first_sights)
    failures = []
    results = run([call[0] for call in calls], Path(sys.argv[1]) / f"process_{Path(tables[0]).name}", launcher)
    for (call, expected, paragraph), (out, err, status) in zip(calls, results):
        expected, *patterns = expected.split("~ ")
        numbers = statements[paragraph]
        lines = lines_of(out, numbers) + ["!" + line for line in lines_of(FOREIGN.sub("", err), numbers)]
        if patterns:
            lines = [f"no {pattern}" for pattern in patterns if not re.search(pattern.strip(), err)]
        if int(status):
            lines.append("aborted" if int(status) in ABORTED else f"status {int(status)}")
        found = "; ".join(lines)
        expected = expected.strip()
        if found != expected:
            same = len(os.path.commonprefix([found, expected]))
            failures.append(f"{call}\n-> {found[:same]}\nthen {found[same:]}\nnot {expected[same:]}\n"
                            f"{err if patterns else ''}")
    sys.exit("\n".join(failures) or None)


main()
