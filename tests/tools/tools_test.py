#!/usr/bin/env python3
"""vokmempool as its users start it: commands, damaged reports and documents, what the library
writes, and random trace lines against a literal count.

usage: tools_test.py VOKMEMPOOL POOL_CHILD GOLDEN

VOK_MEMPOOL_APPROVE in the environment writes the golden texts of tests/golden/tools again.
"""
import json
import os
import random
import re
import sys
import tempfile
from collections import Counter
from fnmatch import fnmatchcase
from pathlib import Path

from support import PROGRAM, Work, data_of, masked, run, same, tool

GOLDEN = Path(sys.argv[3]).resolve()
COMPLETION = GOLDEN.parents[1] / "tools/completion.bash"
REPORTS = {path.stem: path.read_text() for path in (GOLDEN / "report").iterdir()}
DEMO, DETAILED = REPORTS["demo"], REPORTS["detailed"]
USAGE = "\nusage: vokmempool SUBCOMMAND [OPTIONS] [FILE]\n"
PLAIN = "standard input: line 1: a plain report, which has no records to draw"
TRACE = """zvpt:c:a0
zvpt:a:a0:1000:24
zvpt:f:a0:1:
zvpt:a:b0:3000:2000
zvpt:a:a0:2000:16
zvpt:a:a0:1000:8
zvpt:d:b0
zvpt:f:c0:1000:
zvpt:f:a0:1000:
zvpt:c:\tx
zvpt:a:a0:3000:9"""
NAMED = "trace", "--name", "a0=cache"
# What follows the program's name in a shell that lets no closed pipe end a program, the input, the
# status, the output, and what follows the name on the error stream.
COMMANDS = [
    ("", "", 2, "", "A subcommand is required" + USAGE),
    ("--help", "", 0, "*SUBCOMMAND --help*", ""),
    *((f"{name} --help", "", 0, "*Example: *", "") for name in ("report", "picture", "trace", "chart")),
    ("--version", "", 0, "vokmempool 1.*", ""),
    ("reprot", "", 2, "", "there is no subcommand reprot, the nearest is report" + USAGE),
    ("xyzzy", "", 2, "", "there is no subcommand xyzzy" + USAGE),
    ("report --json --check", "", 2, "", "*[--summary,--json,--check,--text,*]" + USAGE),
    ("report /no/such", "", 1, "", "/no/such: can't be opened: No such file or directory\n"),
    ("report /", "", 1, "", "/: can't be read: Is a directory\n"),
    ("report", "MemPool::Mgr a\n" + 60 * "x", 1, "",
     "standard input: line 2: expected \"   Version     : \"*, found \"" + 60 * "x" + "\"\n"),
    ("report --from-json", '{"reports":\n [}', 1, "",
     "standard input: not a JSON document: line 2, column 3\n"),
    ("report --from-json", '{"reports": 1e999}', 1, "",
     "standard input: not a document of reports: a number is too large\n"),
    ("report --from-json", '{"report": []}', 1, "",
     'standard input: not a document of reports: it lacks "reports"\n'),
    ("report --from-json", '{"other": [{}], "reports": []}', 1, "",
     "standard input: there is no report in it\n"),
    ("report", DEMO.replace(" demo", " de\tmo") + DETAILED, 0, """\
pool           used       free        ext    bytes held       payload    share
de\\x09mo        508        280          2         19596          9860   50.3 %
detailed         25         27          3      12349804      12349032  100.0 %
""", ""),
    ("report", DEMO.replace("Enabled     :        1", "Enabled     :        0"), 0,
     "*\ndemo * 50.3 % off\n", "*--check lists them\n"),
    ("report --check", DEMO.replace("  508\n", "  509\n"), 1,
     "line 10: Used Recs is 509, not 508: the sum of Used in BUCKETS\n", "standard input: 1 inconsistency\n"),
    ("report --check", DEMO.replace(" 2000 ", " 2001 ", 1), 1,
     "line *\nline *\n", "standard input: 2 inconsistencies\n"),
    ("report", DEMO.replace("  508\n", "  509\n"), 0, "*\ndemo *",
     "standard input: 1 inconsistency, --check lists them\n"),
    ("report", DEMO * 2, 0, "      line pool *\n         1 demo *\n        57 demo *\n", ""),
    ("report --diff - -", "", 2, "", "--diff: one of two files at most is standard input" + USAGE),
    ("report --diff /dev/null", DEMO, 1, "", "/dev/null: there is no report in it\n"),
    ("report --check", DEMO * 2, 0, "2 reports, no contradiction\n", ""),
    ("report --text", DEMO + DETAILED[:999], 1, DEMO, "standard input: line *: expected *"),
    ("report --check", DEMO.replace("  508\n", "  509\n") + DETAILED[:999], 1, "line 10: *\n",
     "standard input: 1 inconsistency; line *: expected *"),
    ("picture report.txt", "", 2, "", "--output is required" + USAGE),
    ("picture -o page.html", "", 2, "", "REPORT is required" + USAGE),
    ("picture - -o -", DETAILED, 0, "<!DOCTYPE html>\n*</html>\n", ""),
    ("picture - -o plain.html", DEMO, 1, "", PLAIN + "; DbgDetailed writes them\n"),
    ("picture - -o page.html", DEMO + DETAILED, 0, "", PLAIN + "\n"),
    ("trace", "", 1, "", "standard input: there is no trace line in it\n"),
    ("trace --bucket-size 9", "", 2, "", "--bucket-size requires --at" + USAGE),
    ("trace --at 0", "", 2, "", "--at: takes the number of a line, from 1 *, and not 0" + USAGE),
    ("trace --at 1 --bucket-size 4294967296", "", 2, "", "--bucket-size: takes bytes, from 0 *"),
    ("trace --name cache", "", 2, "", "--name: takes POOL=NAME, *"),
    # Another record may have the replay's block of one that was cleared.
    ("trace --at 5", "zvpt:a:a0:1:24\nzvpt:a:a0:2:24\nzvpt:a:a0:1:24\nzvpt:a:a0:3:24\n"
     "zvpt:f:a0:2:\n", 0, "*Used Recs   :        2\n*", "*"),
    ("trace --at 8 --off", TRACE, 0, "*Enabled     :        0\n*", "*"),
    ("trace --at 11 --name a0=cache --name=c0=\x01 --bucket-size 162 --max-record-size 60 "
     "--min-record-size 9 --data-alignment 2 --keep-empty-buckets", TRACE, 0,
     "MemPool::Mgr cache\n*Bucket Size :      162\n*Num Buckets :        1\n      Empty    : "
     "       1\n*Min Rec Sz  :       10\n   Max Rec Sz  :       60\n   Data Align  :        2\n*",
     "\\x01: its first lines are not in the trace\n"
     "vokmempool: cache: a Clear lies between line 2 and line 6, the report is uncertain\n"
     "vokmempool: 2 mixed or cut lines were skipped, the first is line 10\n"),
    ("trace --name b0=x", TRACE + "\n" + DEMO.replace("0x20000000", "0xa0"), 0,
     "*\n  demo: construction line 1*destruction line 7: x:*at 3000 of x, destruction line 7\n*", ""),
    ("trace", "zvpt:c:20000000\n" + DEMO + "zvpt:c:20000000\n" +
     DEMO.replace(" demo", " \x01").replace("\n", "\r\n"), 0,
     "*\n  \\x01: construction line 58,*\n  destruction not in the trace: demo: *, left 0 *", ""),
    ("trace --at 12", TRACE, 1, "", "standard input: it has no line 12, only 11\n"),
    ("report --text > /dev/full", DEMO, 1, "", "standard output: can't be written*"),
    ("report --text | head -1", DEMO * 400, 0, "MemPool::Mgr demo\n", ""),
    ("trace < <(sleep 2.1; echo zvpt:c:a0)", "", 0, "1 lines, 1 *", ""),
]

# The words of a command line, and those that its last one can become.
COMPLETIONS = [
    ("", "--help --version report picture trace chart inspect top record advise replay"), ("re", "report record replay"),
    ("report --s", "--summary --series"), ("picture -", "--help --output"), ("trace out", ""),
    ("report --diff before.txt --", "--help --from-json --lenient --records --summary --json --check "
     "--text --prometheus --series --diff"),
]


def same_as_golden(name, text):
    path = GOLDEN / f"tools/{name}.txt"
    if "VOK_MEMPOOL_APPROVE" in os.environ:
        path.write_text(text)
    same(text, path.read_text(), path)


def is_like(text, form):
    """A star stands for any text, and nothing else of a form is special."""
    return fnmatchcase(text, re.sub(r"[\[?]", r"[\g<0>]", form))


def test_commands():
    for arguments, given, status, output, errors in COMMANDS:
        found = run("bash", "-c", f"trap '' PIPE; {PROGRAM} {arguments}", given=given)
        errors = errors and f"vokmempool: {errors}"
        same((is_like(found[0], output), is_like(found[1], errors), found[2]),
             (True, True, status), f"{arguments}: {found}")
    same(sorted(os.listdir()), ["page.html"], "the written files")
    same_as_golden("trace", tool(*NAMED, "--massif", "massif", given=TRACE))
    same_as_golden("massif", Path("massif").read_text())
    same_as_golden("trace-json", tool(*NAMED, "--json", given=TRACE))
    slow = f"(sleep 2.1; echo zvpt:c:a0) | {PROGRAM} trace"
    terminal = run("script", "-qec", slow, "/dev/null")[0]
    same(is_like(terminal, "\r0 MB done\x1b[K\r\x1b[K1 lines*"), True, repr(terminal))


def test_completion():
    script = """. "$0"; program=$1; shift; COMP_WORDS=(vokmempool "$@"); COMP_CWORD=$#
                _vokmempool "$program"; echo "${COMPREPLY[@]}\""""
    for line, words in COMPLETIONS:
        same(run("bash", "-c", script, COMPLETION, PROGRAM, *line.split(" ")), (f"{words}\n", "", 0), line)


# What no change of one value makes: other states of a stream, the library's warnings.
NUMBERS = ("        e", " 64      ", " ******64", "      064", "        64", " 4294967296")
CHANGES = [
    *((" :       64\n", f" :{number}\n") for number in NUMBERS), (" 12.500%", "12.5000%"),
    (" 12.500%", "  12.50%"), ("+---------+\n", "+\n"), ("| FREE    | \n", 2 * "| FREE    " + "| \n"),
    ("#002\n", "#2\n"), ("#002\n", "#0002\n"), ("Next1       :        0", "Next1       :      0x0"),
    ("Exp $\n", "Exp $\r\n"), ("MemPool::Mgr", "MemPool::Mgr x\nMemPool::Mgr"),
    ("\n   MemPool::Bucket #001 USED", "WARNING:../s/MemPool:  110: Number of recs 7 < 8\n"
     "\n   MemPool::Bucket #001 USED"),
    (" 0 \n\n\n   MemPool::Bucket #002", " 0 \nWARNING:../s/MemPool:12345: Too many free recs "
     "7 > 6\n\n\n   MemPool::Bucket #002"),
]


def messages_on(text, line, *options):
    """The messages on a text without their values, each with whether it names that line."""
    output, errors, _ = run(PROGRAM, "report", "--check", *options, given=text)
    values = r"(?s)vokmempool: standard input: (\d+ inconsistenc.*)?|(, found |\[json).*"
    for message in re.sub(values, "", output + errors).splitlines() or ["nothing"]:
        _, number, message = re.fullmatch("(line (\\d+): )?(.*)", message).groups()
        yield re.sub('".*"|0x[0-9a-f]+|\\d+', "#", message), number == str(line)


def prefixed(text):
    """As a log writes it, with another time in each line."""
    lines = enumerate(text.splitlines())
    return "".join(f"Nov 26 00:{i % 6000 // 60:02}:{i % 60:02} host program[71]: {line}".rstrip() + "\n"
                   for i, line in lines)


def interrupted(text):
    """With lines of others, but for a title, whose name can have more than one."""
    lines = text.splitlines(keepends=True)
    return "".join(f"{line}other {i}\n" * (i % 9 == 5) or line for i, line in enumerate(lines))


# A form of a text, and what a lenient reading passes over.
FORMS = [
    (prefixed, "a prefix on 515 lines, blanks missing at the end of * lines"),
    (interrupted, "57 lines that no report has, the first is line 7"),
    (lambda text: re.sub(" +$", "", text, flags=re.M), "blanks missing at the end of * lines"),
    (lambda text: text.replace("\n", "\r\n", 300), "CR and LF at the end of 300 lines"),
    (lambda text: prefixed(interrupted(text)), "57 lines that no report has, * a prefix on *"),
]


def test_lenient():
    text = DEMO + DETAILED
    for i, (form, passed) in enumerate(FORMS):
        output, errors, status = run(PROGRAM, "report", "--lenient", "--text", given=form(text))
        whole = f"vokmempool: standard input: passed over {passed}\n"
        same((output, is_like(errors, whole), status), (text, True, 0), f"form {i}: {errors}")
        # A report that isn't whole is named, and those around it are shown.
        cut = form(DETAILED[:DETAILED.index("\n", 5000) + 1] + text)
        output, errors, status = run(PROGRAM, "report", "--lenient", "--text", given=cut)
        same((output, "expected" in errors, status), (text, True, 1), f"form {i} of a cut: {errors}")


def changed_reports():
    """The line and the text of a change: every second value is another one of its width, every
    second line is gone, and the end is."""
    others = {"USED": "UNKN", "FREE": "USED", " + ": "   ", "9": "8", "f": "e"}

    def another(old):
        return others.get(old) or old[:-1] + (others.get(old[-1]) or chr(ord(old[-1]) + 1))

    values = re.finditer(r"(?<![\w.])(?:0x[0-9a-f]+|\d+)|USED|FREE|\*+| \+ ", DETAILED)
    changes = [(*found.span(), another(found[0])) for found in list(values)[::2]]
    changes += [(*found.span(), "") for found in list(re.finditer(".*\n", DETAILED))[::2]]
    changes += [(end, len(DETAILED), "") for end in range(0, len(DETAILED), 97)]
    changes += [(DETAILED.index(old), DETAILED.index(old) + len(old), new) for old, new in CHANGES]
    for start, end, new in changes:
        yield DETAILED.count("\n", 0, start) + 1, DETAILED[:start] + new + DETAILED[end:]


def changed_documents(document):
    """Of each key once: another name, and other values. And a report that lacks one bucket."""
    yield re.sub('^{"number":1,.*\n', "", document, flags=re.M)
    for key in sorted(set(re.findall('"(\\w+)":', document))):
        start, name, value, end = re.search(
            f'^(.*?")({key}":\\[?)("[^"]*"|[\\w.]+)?(.*)$', document, re.S).groups()
        yield f"{start}_{name}{value or ''}{end}"
        for other in ("-1", "0", "101", "4294967296", r'"0\nx"', f"{value},{value}") if value else ():
            yield start + name + other + end


def test_changes():
    """The golden text has each message, how often it names the line of the change, and how often
    not."""
    messages = Counter()
    for line, text in changed_reports():
        messages.update(messages_on(text, line))
    for document in changed_documents(tool("report", "--json", given=DETAILED)):
        messages.update(messages_on(document, 0, "--from-json"))
    text = "".join(f"{messages[form, True]:5} {messages[form, False]:5} {form}\n"
                   for form in sorted({form for form, _ in messages}))
    same_as_golden("messages", text)


NAMES = ("", "two\nlines", "caf\xe9", "\xe2\x82\xac", '"\\\t', "MemPool", "cache")


def test_library():
    """The program reads, writes again, finds consistent and can rebuild what the library prints."""
    for text in REPORTS.values():
        if text.startswith("MemPool::Mgr "):
            data_of(text)
    for seed in range(40):
        draw = random.Random(seed)
        names, clears, off = draw.sample(NAMES, 2), seed % 3 == 2, seed % 20 == 19
        work = Work(seed, draw.randrange(2, 900), int(clears), names, int(off))
        first, second = work.reports
        front = "" if "two\nlines" in names else "and on: "  # a title in a line must be a whole one
        text = f"MemPool\n\n{front}{first}{work.output}"
        same(tool("report", "--text", given=text), first + first + second, "reports in an output")
        same(run(PROGRAM, "report", "--check", given=text),
             ("6 reports, no contradiction\n", "", 0), f"seed {seed}")
        data_of(first.replace("\n", "\r\n"))
        data = data_of(second)
        found = [bytes.fromhex(pool.get("nameBytes", "")).decode("latin-1") or pool["name"]
                 for pool in data]
        same(sorted(found), sorted(names), "the names")
        if off:
            continue
        made = re.findall("^zvpt:c:(.*)", work.trace, re.M)
        named = [f"--name={addr}={name}" for addr, name in zip(made, names)]
        if not clears:
            again = tool("trace", "--detailed", "--at", work.trace.count("\n"), *named,
                         given=work.output, keys=work.keys)
            same(masked(again), masked(second), f"seed {seed}")
        used = {int(row["data"], 16) for pool in data for row in pool["extRecs"]["rows"]}
        used.update(int(row["addr"], 16) + 4 for pool in data for bucket in pool["bucketReports"]
                    for row in bucket["records"]["rows"] if row["type"] == "USED")
        live = json.loads(tool("trace", "--json", given=work.trace))["live"]
        certain = {int(row["data"], 16) for row in live if not row["uncertain"]}
        same(certain - used, set(), f"the live records of seed {seed}")


def records_of(report):
    """The size of each used record by address."""
    rows = {int(row["addr"], 16) + 4: row["dataSize"] for bucket in report["bucketReports"]
            for row in bucket["records"]["rows"] if row["type"] == "USED"}
    return rows | {int(row["data"], 16): row["length"] for row in report["extRecs"]["rows"]}


def test_growth():
    """What changed between two reports of a pool, the rows of both, and the figures of the last."""
    half, end = Work(11, 1500, names=("a \"b\"\\", "gone")).reports
    Path("half").write_text(half)
    was, now = (next(report for report in data_of(text) if report["name"] != "gone")
                for text in (half, end))
    ours = re.search("(?s)^MemPool::Mgr a.*?(?=^MemPool::Mgr gone|\\Z)", end, re.M)[0]
    diff = tool("report", "--diff", "half", "--records", given=ours).splitlines()
    same([line.split()[0] for line in diff if line[0] != " "], ["a", "gone"], "the pools that differ")
    same("gone went: used -" in "\n".join(diff), True, "a pool that went")
    mine = diff[:diff.index(next(line for line in diff if line.startswith("gone")))]
    first, later = records_of(was), records_of(now)
    same(sorted(line for line in mine if re.match("  (came|went): ", line)),
         sorted([f"  came: {size} bytes at {at:#x}" for at, size in later.items() - first.items()] +
                [f"  went: {size} bytes at {at:#x}" for at, size in first.items() - later.items()]),
         "the records")
    same(f"used {len(later) - len(first):+}" in mine[0] or len(later) == len(first), True, mine[0])
    same(tool("report", "--diff", "half", given=half), "", "no difference")
    series = [line.split(",") for line in tool("report", "--series", given=half + ours).splitlines()]
    same([row[2:6] for row in series[1:] if row[1].startswith('"a')],
         [[str(report["header"][key]) for key in ("usedRecs", "freeRecs", "extRecs", "numBuckets")]
          for report in (was, now)], "the rows of a pool")
    rows = json.loads(tool("report", "--series=json", given=half + ours))
    same([[str(row[key]) for key in series[0] if key != "pool"] for row in rows],
         [row[:1] + row[2:] for row in series[1:]], "the same rows as JSON")
    same([row["pool"] for row in rows[::2]], ['a "b"\\'] * 2, "the pools of the rows")
    metrics = tool("report", "--prometheus", given=half + ours)
    same(re.findall(r'^vokmempool_used_records\{pool="a \\"b\\"\\\\"\} (.*)', metrics, re.M),
         [str(now["header"]["usedRecs"])], "the metric of the last report")
    grammar = r'(# (HELP|TYPE) vokmempool_\w+ .*\n|vokmempool_\w+\{pool="([^"\\\n]|\\["\\n])*"\} \d+\n)*'
    same(re.fullmatch(grammar, metrics) is not None, True, metrics)


EVENTS = ("zvpt:c:5581c0de", "zvpt:d:003a1f40\r", "zvpt:a:1:ffffffffffffffff:1073741823",
          "zvpt:a:1:2:0", "zvpt:f:1:2:")
MIXED = ("zvpt:a:1:2:1073741824", "zvpt:a:1:2:007", "zvpt:a:1:2:1,000", "zvpt:a:1:2:",
         "zvpt:f:1:2:3", "zvpt:a:1:10000000000000000:4", "zvpt:a:1F:2:4", "zvpt:c:", "zvpt:c:1:",
         "zvpt:e:1", "zvpt:zvpt:a:1:2:4", "ready zvpt:c:1", 300 * "x" + "zvpt:")
OTHER = ("zvpt", "")


def lines_at_random(draw, steps, wild):
    """Trace lines: requests of fresh addresses and Frees of live ones, but a share of anything."""
    held = []
    for step in range(steps):
        pool = draw.choice(("a0", "b0", "c0"))
        if draw.random() < wild:
            data = draw.choice(held)[1] if held else "5"
            yield draw.choice(EVENTS + MIXED + OTHER + 4 * (
                f"zvpt:c:{pool}", f"zvpt:d:{pool}", f"zvpt:a:{pool}:{data}:{step % 30}",
                f"zvpt:f:{pool}:{data}:"))
        elif not held or draw.random() < .65:
            held.append((pool, f"{step * 16 + 16:x}"))
            yield "zvpt:a:{}:{}:{}".format(*held[-1], draw.randrange(100))
        else:
            yield "zvpt:f:{}:{}:".format(*held.pop(draw.randrange(len(held))))


def literal(lines):
    """The bytes after each event, and what --json says of the lines, by walks over plain lists."""
    pools, live, left, refused, course, at = {}, {}, [], [], [0], [None]
    sizes, lifetimes, numbers = Counter(), Counter(), Counter()
    for number, line in enumerate(lines, 1):
        if line in MIXED + OTHER:
            continue
        letter, addr, data, size, *_ = line.rstrip("\r")[5:].split(":") + ["", ""]
        addr, old = addr.lstrip("0"), live.get(data)
        if letter == "d" or letter == "c" and addr in pools:
            numbers["gone"] += 1
            pools.pop(addr, None)
            left += [{**record, "gone": number if letter == "d" else None}
                     for record in live.values() if record["pool"] == addr]
            live = {data: record for data, record in live.items() if record["pool"] != addr}
        numbers["made"] += letter == "c"
        if letter != "d":
            pool = pools.setdefault(addr, {
                "pool": addr, "name": None, "made": number if letter == "c" else None, "gone": None,
                "requests": 0, "frees": 0, "peakBytes": 0, "numClears": 0, "clears": []})
        if letter == "a":
            owner = old and pools[old["pool"]]
            if old and old["uncertain"]:
                owner["clears"][-1]["after"] = max(owner["clears"][-1]["after"], old["line"])
            elif old:
                numbers["clears"] += 1
                owner["numClears"] += 1
                owner["clears"].append({"after": old["line"], "before": number})
                for record in live.values():
                    record["uncertain"] |= record["pool"] == old["pool"]
            live.pop(data, None)
            live[data] = {"line": number, "pool": addr, "data": data, "size": int(size),
                          "uncertain": False}
            sizes[int(size)] += 1
            pool["requests"] += 1
        elif letter == "f" and old and old["pool"] == addr:
            pool["frees"] += 1
            if not old["uncertain"]:
                lifetimes[1 << (len(at) - at.index(old["line"])).bit_length() - 1] += 1
            del live[data]
        elif letter == "f":
            refused.append({"line": number, "pool": addr, "data": data,
                            "liveIn": old and old["pool"]})
        for pool in pools.values():
            pool.update(records=0, bytes=0, uncertainRecords=0, uncertainBytes=0)
        for record in live.values():
            pool, doubt = pools[record["pool"]], record["uncertain"]
            pool["uncertainRecords" if doubt else "records"] += 1
            pool["uncertainBytes" if doubt else "bytes"] += record["size"]
        for pool in pools.values():
            pool["peakBytes"] = max(pool["peakBytes"], pool["bytes"])
        course.append(sum(pool["bytes"] for pool in pools.values()))
        at.append(number)
    mixed = [{"line": number, "text": line[:200]} for number, line in enumerate(lines, 1)
             if line in MIXED]
    return course, {
        **{key: numbers[key] for key in ("made", "gone", "clears")}, "events": len(course) - 1,
        "bytes": course[-1], "peakBytes": max(course), "peakLine": at[course.index(max(course))],
        "mixed": len(mixed), "mixedLines": mixed[:100], "live": list(live.values()),
        "numLeft": len(left), "left": left[:100],
        "refused": len(refused), "refusedFrees": refused[:100],
        "sizes": [{"size": size, "requests": sizes[size]} for size in sorted(sizes)],
        "lifetimes": [{"from": least, "records": lifetimes[least]} for least in sorted(lifetimes)],
        "standingPools": sorted(pools.values(),
                                key=lambda pool: (pool["made"] or 0, int(pool["pool"], 16)))}


def test_trace():
    for seed in range(30):
        draw = random.Random(seed)
        steps, wild = (draw.randrange(1, 600), draw.choice((.02, .1, .5))) if seed else (5000, .02)
        lines = list(lines_at_random(draw, steps, wild))
        course, expected = literal(lines)
        text = "".join(f"{line}\n" for line in lines)
        found = json.loads(tool("trace", "--json", "--massif", "massif", given=text))
        same({key: found[key] for key in expected}, expected, f"seed {seed}")
        massif = Path("massif").read_text()
        samples = [(int(time), int(held)) for time, held in re.findall(
            "^time=(\\d+)\nmem_heap_B=(\\d+)$", massif, re.M)]
        same(samples, [(time, course[time]) for time in sorted(dict(samples))], "samples")
        same((min(len(course), 50) <= len(samples) <= 102, samples[-1][0]), (True, len(course) - 1),
             f"{len(samples)} samples")
        at_peak = sum(map(int, re.findall("^ n0: (\\d+) pool ", massif, re.M)))
        same((at_peak, max(dict(samples).values())), (max(course), max(course)), "the peak")


with tempfile.TemporaryDirectory() as folder:
    os.chdir(folder)
    test_commands()
    test_completion()
    test_changes()
    test_lenient()
    test_library()
    test_growth()
    test_trace()
