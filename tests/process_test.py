#!/usr/bin/env python3
"""Child programs under environment keys: all that each writes and how it ends. Arguments: the folder
of the programs, and the command that starts one where they don't start by themselves; or --observers
for the memory-checking tools."""
import collections
import itertools
import os
import pathlib
import re
import shutil
import subprocess
import sys

# A call on each line, "[PROGRAM] [KEY=VALUE]... : OPERATION; ... | OPERATION AT EXIT; ...", and
# after "->" what it writes, line by line, with a "!" before a line on the error stream, and its
# status, if it isn't 0. A line that begins with a space continues the one above. The first word
# may have alternatives: ON=* means ON=0|ON=1. The statements of messages are numbered
# within a paragraph.
CALLS = """
# What passes each key's test, and the banner.
INFO=0 : say main -> banner 4010 4 0 1000 8 0 1; main
INFO=yes ON=1 ZOR_MEMPOOL_ON=0 TRACE=2 BUCKET_SIZE=0 MAX_RECORD_SIZE=32767 MIN_RECORD_SIZE=4
    DATA_ALIGNMENT=0 KEEP_EMPTY_BUCKETS=2 : -> banner 0 1 1 32767 4 1 0
INFO=1 ON=0 ZOR_MEMPOOL_ON=1 TRACE=0 BUCKET_SIZE=x MAX_RECORD_SIZE=32768 MIN_RECORD_SIZE=3
    DATA_ALIGNMENT=-8 KEEP_EMPTY_BUCKETS=0 : -> banner 0 1 0 1000 8 0 0
INFO=+2x ON=x ZOR_MEMPOOL_ON=-1 TRACE=-1 BUCKET_SIZE=-1 MAX_RECORD_SIZE=-1 MIN_RECORD_SIZE=0
    DATA_ALIGNMENT=1 KEEP_EMPTY_BUCKETS=1 : -> banner 4010 1 1 1000 8 0 1
INFO=0 ON=-1 ZOR_MEMPOOL_ON=x TRACE=1 BUCKET_SIZE=2147483647 MAX_RECORD_SIZE=+9x
    DATA_ALIGNMENT=65535 KEEP_EMPTY_BUCKETS=-1 : -> banner 2147483647 65535 0 9 8 1 1
INFO=0 ZOR_MEMPOOL_ON=2 DATA_ALIGNMENT=65537 MIN_RECORD_SIZE=x KEEP_EMPTY_BUCKETS=x : cut
    -> banner 4010 1 0 1000 8 0 0; status 7
INFO=0 ON=2 MAX_RECORD_SIZE=0 : say main -> banner 4010 4 0 0 8 0 0; !EXCEPTION 12: (8>=0); aborted
INFO=-1 MIN_RECORD_SIZE=-1 : say main -> !EXCEPTION 12: (4294967295>=1000); aborted

# The ERROR lines of a handle, then those of a pool.
ON=* TRACE=1 : pool a; set max=5000; pool a | names
    -> zvpt:c:@1; ERROR 1: duplicate 'a'; 1 of 2: a; status 1
ON=* : pool __VOK_MEMPOOL_00001; nameless -> ERROR 1: duplicate '__VOK_MEMPOOL_00001'; status 1
ON=* : grouping; pool a; alloc 4294967295 -> ERROR 2: limit 4294967295; status 1
ON=* : pool a; alloc 17179869200 -> ERROR 2: limit 17179869200; status 1

ON=* TRACE=1 : set max=4294967295; pool a
    -> zvpt:c:@1; ERROR 1: maximum (4294967292>4006) [4010]; status 1
ON=* BUCKET_SIZE=70000 : set max=65535; pool a -> ERROR 1: maximum (65532>65531) [65535]; status 1
ON=* BUCKET_SIZE=0 : pool a -> ERROR 1: maximum (1000>4294967292) [0]; status 1
ON=* BUCKET_SIZE=1003 : set min=2000; pool a -> ERROR 1: maximum (1000>999) [1003]; status 1
ON=* : set min=1001; pool a -> ERROR 2: minimum (1004>1000); status 1
ON=* : set min=4294967295; pool a -> ERROR 2: minimum (4294967296>1000); status 1

# Pools by name, none of which is one, too.
ON=* : names; find a; find; pool b; pool D; pool; pool ab; pool a; names; find a; find A; find d;
    find; drop; find a; pool a; find a
    -> 0 of 1:; 0; 0; 5 of 10:  D a ab b; 4; 5; 5; 2; 4; 4

# The last values that fit.
ON=* : pool a; drop; pool a; alloc 1; free 0; alloc 1073741823; drop -> freed
ON=* BUCKET_SIZE=70000 : set max=65531; pool a; alloc 65524; free 0 -> freed

# An ERROR line is whole before the exit, which runs what is queued for it.
TRACE=1 ZOR_STATIC_POOLS=1 : pool a; set max=3; pool b | names
    -> zvpt:c:@1; zvpt:c:@2; zvpt:c:@3; zvpt:c:@4; ERROR 1: minimum (8>0);
    3 of 6: __VOK_MEMPOOL_00001 a client; zvpt:d:@2; zvpt:d:@1; status 1
ON=* TRACE=1 : pool a; alloc 1073741824 | cut -> zvpt:c:@1; ERROR 2: limit 1073741824; status 7

# A library's static pools, and the pools that its unloading leaves.
pool_host ON=1 TRACE=1 ZOR_STATIC_POOLS=1 : open client; pool a; close; open client; pool b; names
    -> zvpt:c:@1; zvpt:c:@2; zvpt:c:@3; zvpt:d:@2; zvpt:d:@1; zvpt:c:@4; zvpt:c:@5; zvpt:c:@6;
    3 of 6: __VOK_MEMPOOL_00001 b client; zvpt:d:@5; zvpt:d:@4
"""

# Checked pools: they say what they find, or end with it, at the pool's end too.
CHECKED = """
CHECK=1 ON=1 : pool a; alloc 10; free 0; free 0; alloc 8; free 1; drop
    -> freed; WARNING 1: Pool 'a': second Free of 0x@, a record of 10 bytes, request 1; refused; freed
CHECK=2|CHECK=+3x ON=1 : pool a; alloc 10; free 0; free 0 | names
    -> freed; ERROR 2: Pool 'a': second Free of 0x@, a record of 10 bytes, request 1; 1 of 2: a; status 1
CHECK=2 ON=1 : pool a; alloc 10; drop | names
    -> ERROR 2: Pool 'a': still in use at the end: 0x@, a record of 10 bytes, request 1; 0 of 1:; status 1
CHECK=0|CHECK=-1|CHECK=x ON=1 : pool a; alloc 10; drop | names -> 0 of 1:
CHECK=2 ON=0 : pool a; alloc 10; drop | names -> 0 of 1:
"""

# The registry is destroyed first, and pools still serve. A failed load at run time throws its text,
# and the library stays, with the settings as read. Each key is looked up once, in its order.
ON_LINUX = """
pool_host ON=1 TRACE=1 ZOR_STATIC_POOLS=1 : open client; pool a | names; alloc 10; free 0; drop;
    pool a; names -> zvpt:c:@1; zvpt:c:@2; zvpt:c:@3; zvpt:d:@2; zvpt:d:@1; 0 of 1:; zvpt:a:@3:@4:10;
    zvpt:f:@3:@4:; freed; zvpt:d:@3; zvpt:c:@5; 1 of 2: a
pool_host MIN_RECORD_SIZE=1000 ON=1 TRACE=1 : grouping; open library; open client; nameless;
    alloc 10 -> EXCEPTION 1: (1000>=1000); zvpt:c:@1; zvpt:a:@1:@2:10; !EXCEPTION 1: (1000>=1000)
ZOR_SHOW_KEYS=1 ON=0 : -> ON; ZOR_MEMPOOL_ON; TRACE; BUCKET_SIZE; MAX_RECORD_SIZE;
    MIN_RECORD_SIZE; DATA_ALIGNMENT; KEEP_EMPTY_BUCKETS; INFO; CHECK
ZOR_SHOW_KEYS=1 ON=1 : -> ON; TRACE; BUCKET_SIZE; MAX_RECORD_SIZE; MIN_RECORD_SIZE; DATA_ALIGNMENT;
    KEEP_EMPTY_BUCKETS; INFO; CHECK
"""

# A program's handlers run ahead of any library's, and a load throws nothing to its caller.
ON_WINDOWS = """
pool_host ON=1 TRACE=1 ZOR_STATIC_POOLS=1 : open client; pool a | names; alloc 10; free 0; drop
    -> zvpt:c:@1; zvpt:c:@2; zvpt:c:@3; 3 of 6: __VOK_MEMPOOL_00001 a client; zvpt:a:@3:@4:10;
    zvpt:f:@3:@4:; freed; zvpt:d:@3; zvpt:d:@2; zvpt:d:@1
pool_host MIN_RECORD_SIZE=1000 : open library -> !EXCEPTION 1: (1000>=1000); aborted
"""

# What each memory-checking tool must find, after each "~" a pattern. A record of 9 bytes has 12, and an empty
# bucket that is kept is no leak. The records are what heaptrack counts, and not their blocks.
FAULTS = r"""
memcheck ON=1 : pool a; alloc 9; write 9 -> status 9 ~ Invalid write of size 1
    ~ 0 bytes after a block of size 9 client-defined
memcheck ON=1 : pool a; alloc 10; write -1 -> status 9
    ~ 1 bytes before a block of size 10 client-defined
memcheck ON=1 : pool a; alloc 5000; write 5000 -> status 9
    ~ 0 bytes after a block of size 5,000 client-defined
memcheck ON=1 : pool a; alloc 10; alloc 10; free 1; write 0 -> status 9
    ~ Invalid write of size 1\n.*::Write\(
memcheck ON=1 : pool a; alloc 10; clear; write 0 -> status 9
    ~ 0 bytes inside a block of size 10 free.d ~ Mgr::Clear
memcheck ON=1 : pool a; alloc 10; reset; write 0 -> status 9 ~ Invalid write of size 1
memcheck ON=1 : pool a; alloc 10; write 20 -> status 9 ~ Invalid write of size 1
memcheck ON=0 : pool a; alloc 10; free 0; free 0 -> status 9 ~ Invalid free
    ~ ::Free\w*\(.*\n.*pool_child.cpp
asan ON=1 : pool a; alloc 9; write 9 -> status 1
    ~ AddressSanitizer: (use-after-poison|unknown-crash) ~ in Write
asan ON=1 : pool a; alloc 10; alloc 10; free 1; write 0 -> status 1 ~ use-after-poison ~ in Write
asan ON=1 : pool a; alloc 10; write 20 -> status 1 ~ use-after-poison ~ in Write
asan ON=1 : pool a; alloc 10; reset; write 0 -> status 1 ~ use-after-poison ~ in Write
asan ON=1 : pool a; alloc 10; clear; write 0 -> status 1 ~ heap-use-after-free ~ freed by
memcheck ON=1 KEEP_EMPTY_BUCKETS=1 : pool a; alloc 11; alloc 100; free 1; alloc 10; forget; alloc 5000;
    forget -> status 9 ~ (?s)^(?!(.*definitely lost){3})
    ~ 10 bytes in 1 blocks are definitely lost ~ 5,000 bytes in 1 blocks are definitely lost
    ~ ::Alloc\(.*pool_child.cpp
heaptrack ON=1 KEEP_EMPTY_BUCKETS=1 : pool a; alloc 5000; reset; alloc 11; alloc 5000; alloc 100;
    free 2; free 3; alloc 10; forget
    -> ~ (?m)^21B leaked over ~ (?s)^(?!.*Bucket::Create)

# What neither of two may find. A second Free returns false.
memcheck|asan ON=1 : pool a; alloc 10; alloc 10; free 1; free 1; size 1; contains 1; drop
    -> freed; refused; 0; 0
memcheck|asan ON=1 : pool a; alloc 12; alloc 12; free 0; write 0; alloc 12; write 16; drop -> freed
memcheck|asan ON=1 : pool a; alloc 13; alloc 5000; report; free 0; free 1; alloc 996; clear;
    alloc 8; alloc 5000; reset; alloc 5000; drop -> ~ ^$
memcheck|asan ON=1 CHECK=2 : pool a; alloc 13; alloc 5000; free 0; alloc 8; alloc 9; drop -> ~ ^$

# How often the heap returns memory: never within the slack, once for a Clear or a pool beyond it.
strace ON=1 : pool a; build 100; clear; build 1000; clear; build 10000; drop -> ~ ^0 shrinks
strace ON=1 : pool a; build 20000; clear; build 20000; drop -> ~ ^2 shrinks
# The slack is asked for once, and not of another heap than glibc's.
strace ON=1 : pool a; pool b -> ~ shrinks, 1 maps
mimalloc ON=1 : pool a; pool b -> ~ shrinks, 0 maps
trimming ON=1 : pool a; build 100; clear; build 1000; clear; build 10000; drop -> ~ ^3 shrinks
"""
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
    "0x[0-9a-f]+": "0x@",
}

MESSAGE = re.compile(
    r"^(?:(ERROR|WARNING|INFO):\.\./s/MemPool:(?=.{5}:) *|(EXCEPTION):\.\./s/MemPool:)([1-9]\d*):", re.M)
TRACE = re.compile(r"^zvpt:(.):([0-9a-f]+)(?::([0-9a-f]+)(?=:\d*$))?", re.M)
# What the language's runtime and the emulator say of an abort is not the library's.
FOREIGN = re.compile(r"^(terminate called|qemu: uncaught).*\n", re.M)
# The statuses of an abort, and of an exception that Windows takes itself.
ABORTED = (128 + 6, 3, 0x20474343)

PROGRAMS = pathlib.Path(sys.argv[1])
OBSERVERS = sys.argv[2:] == ["--observers"]
LAUNCHER = "" if OBSERVERS else " ".join(sys.argv[2:])
WINDOWS = (PROGRAMS / "pool_child.exe").exists()
# Under the address sanitizer no pool checks.
CHECKS = WINDOWS or b"__asan_init" not in (PROGRAMS / "pool_child").read_bytes()


def calls_in(text):
    """The calls, each with its outcome and its paragraph."""
    for paragraph in text.split("\n\n"):
        for line in re.sub("\n +", " ", paragraph).splitlines():
            turns, _, rest = line.replace("ON=*", "ON=0|ON=1").partition(" ")
            for turn in turns.split("|") if turns.strip("#") else ():
                yield *f"{turn} {rest}".split(" -> "), paragraph


def run(calls):
    """Makes the calls in one script of the platform's shell, so that an emulated system starts once;
    the output, the error output and the status of each."""
    script = ""
    for i, call in enumerate(calls):
        program, keys, operations = re.match(r"(?:(\w+) )?(.*?):(.*)", call).groups("pool_child")
        keys = [key if key.startswith("ZOR") else f"ZOR_VOK_MEMPOOL_{key}" for key in keys.split()]
        if program == "pool_host":  # a client that is unloaded loses its pool
            keys.append("LSAN_OPTIONS=detect_leaks=0")
        if WINDOWS:
            script += "".join(f"set {key}\n" for key in keys)
            script += f'..\\{program} "{operations}" >{i}.out 2>{i}.err\necho %errorlevel% >{i}.status\n'
            script += "".join(f"set {key.split('=')[0]}=\n" for key in keys)
        else:
            command = COMMANDS.get(program, f"exec {LAUNCHER} ../{program} {{}}").format(f'"{operations}"')
            script += f"(export LC_ALL=C {' '.join(keys)}; {command}) >{i}.out 2>{i}.err\necho $? >{i}.status\n"
    folder = PROGRAMS / ("observer_calls" if OBSERVERS else "process_calls")
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir()
    (folder / "calls.bat").write_text(script)
    env = {key: value for key, value in os.environ.items() if not key.startswith("ZOR_")}
    subprocess.run([*LAUNCHER.split(), "cmd", "/c", "calls.bat"] if WINDOWS else ["sh", "calls.bat"],
                   cwd=folder, env=env, capture_output=True, check=False)
    for i in range(len(calls)):
        yield [(folder / f"{i}.{kind}").read_text() for kind in ("out", "err", "status")]


def masked(text, statements):
    """The lines with what differs from build to build and from run to run replaced: the source lines
    of messages, if they fill their field as they should, and the addresses of trace lines."""
    addresses = collections.defaultdict(itertools.count(1).__next__)

    def address(match):
        letter, pool, block = match.groups()
        shown = f"zvpt:{letter}:@{addresses[pool]}" + (f":@{addresses[block]}" if block else "")
        if letter in "df":  # a freed address may be used again
            del addresses[block or pool]
        return shown

    text = MESSAGE.sub(lambda m: f"{m[1] or m[2]} {statements[m[3]]}:", text)
    text = TRACE.sub(address, text)
    for pattern, short in SHORT.items():
        text = re.sub(pattern, short, text)
    return text.splitlines()


def main():
    text = FAULTS if OBSERVERS else CALLS + CHECKED * CHECKS + (ON_WINDOWS if WINDOWS else ON_LINUX)
    calls = list(calls_in(text))
    statements = collections.defaultdict(lambda: collections.defaultdict(itertools.count(1).__next__))
    failures = []
    for (call, expected, paragraph), (out, err, status) in zip(calls, run([c[0] for c in calls])):
        expected, *patterns = expected.split("~ ")
        numbers = statements[paragraph]
        lines = masked(out, numbers) + ["!" + line for line in masked(FOREIGN.sub("", err), numbers)]
        if patterns:
            lines = [f"no {pattern}" for pattern in patterns if not re.search(pattern.strip(), err)]
        if int(status):
            lines.append("aborted" if int(status) in ABORTED else f"status {int(status)}")
        found = "; ".join(lines)
        if found != expected.strip():
            failures.append(f"{call}\n-> {found}\nnot {expected}\n{err if patterns else ''}")
    sys.exit("\n".join(failures) or None)


main()
