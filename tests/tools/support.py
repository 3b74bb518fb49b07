"""What the tests of vokmempool share: it started, pools at work, and what a report says of them."""
import json
import os
import random
import re
import subprocess
import sys

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


class Work:
    """Two pools at random work under random settings: the program's output, and in it the trace
    lines and reports in detail of one moment at half time and one at the end."""

    def __init__(self, seed, steps, clears=0, names=("first", "second"), off=0):
        draw = random.Random(seed)
        alignment, smallest = draw.choice((1, 2, 3, 4, 4, 4, 8, 16)), draw.randrange(4, 44)
        largest = smallest + 2 * alignment + draw.randrange(200)
        self.keys = {"ZOR_VOK_MEMPOOL_" + key: str(value) for key, value in {
            "ON": 1 - off, "DATA_ALIGNMENT": alignment, "MIN_RECORD_SIZE": smallest,
            "MAX_RECORD_SIZE": largest, "BUCKET_SIZE": largest + 4 + draw.randrange(1500),
            "KEEP_EMPTY_BUCKETS": draw.randrange(2)}.items()}
        self.output, errors, status = run("setarch", "-R", POOLS, seed, steps, clears, *names,
                                          keys={**self.keys, "ZOR_VOK_MEMPOOL_TRACE": "1"})
        same((errors, status), ("", 0), f"the pools of seed {seed}")
        titles = [found.start() for found in re.finditer("^MemPool::Mgr ", self.output, re.M)]
        self.ends = titles[0], titles[2]
        self.reports = [re.sub("^zvpt:.*\n", "", text, flags=re.M) for text in
                        (self.output[:titles[2]], self.output[titles[2]:])]


def data_of(text):
    """The reports of a text, which makes the way to JSON and back unchanged."""
    same(tool("report", "--text", given=text), text, "the reports by themselves")
    document = tool("report", "--json", given=text)
    same(tool("report", "--from-json", "--text", given=document), text, "the reports by JSON")
    return json.loads(document)["reports"]
