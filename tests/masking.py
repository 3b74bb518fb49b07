"""Texts without what differs from build to build and from run to run."""
import re
from collections import defaultdict
from itertools import count

# A blank before an address belongs to its field.
ADDRESS = re.compile(r"^zvpt:(.):([0-9a-f]+)(?::([0-9a-f]+)(?=:\d*$))?|( ?) *0x([0-9a-f]+)", re.M)
MESSAGE = re.compile(
    r"^(?:(ERROR|WARNING|INFO):\.\./s/MemPool:(?=.{5}:) *|(EXCEPTION):\.\./s/MemPool:)([1-9]\d*):", re.M)


def first_sights():
    """The numbers of keys, in the order in which they are first asked for."""
    return defaultdict(count(1).__next__)


def masked(text, statements=None):
    """Addresses and source lines of messages as numbers; a freed address gets a new one."""
    addresses = first_sights()
    lines = first_sights() if statements is None else statements

    def number(match):
        letter, pool, block, blank, bare = match.groups()
        if bare:
            return f"{blank}@{addresses[bare]}"
        shown = f"zvpt:{letter}:@{addresses[pool]}" + (f":@{addresses[block]}" if block else "")
        if letter in "df":
            del addresses[block or pool]
        return shown

    text = MESSAGE.sub(lambda found: f"{found[1] or found[2]} {lines[found[3]]}:", text)
    return ADDRESS.sub(number, text)
