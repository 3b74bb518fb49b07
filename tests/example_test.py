#!/usr/bin/env python3
"""Runs an example by the command given as arguments, and compares what it prints with its golden
text, or writes that again if VOK_MEMPOOL_APPROVE is set. The sizes that go with the width of a pointer
become an N. With its pools checked, an example has no fault but the one that plants some."""
import os
import re
import subprocess
import sys
from pathlib import Path

from masking import masked

NAME = Path(sys.argv[-1]).stem
GOLDEN = Path(__file__).parent / f"golden/examples/{NAME}.txt"


def output(**keys):
    done = subprocess.run(sys.argv[1:], stdout=subprocess.PIPE, text=True, check=True, env=os.environ | keys)
    return re.sub(r"(?m)^( +Sizeof (?:Buck|    ) +: +)\d+$", r"\1N", masked(done.stdout))


found = output()
if "VOK_MEMPOOL_APPROVE" in os.environ:
    GOLDEN.write_text(found)
if found != GOLDEN.read_text():
    sys.exit(f"{GOLDEN}: found\n{found}")
if "WARNING" in output(ZOR_VOK_MEMPOOL_CHECK="1") and NAME != "10-checked":
    sys.exit("a sound example has findings")
