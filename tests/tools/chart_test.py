#!/usr/bin/env python3
"""Draws pools over time, from their reports and from their trace, and compares in a browser what the
page says with them.

usage: chart_test.py VOKMEMPOOL POOL_CHILD CHROMIUM
"""
import re
import sys
import tempfile
from contextlib import chdir
from pathlib import Path

from browser import Browser
from support import Work, run, same, tool, PROGRAM

TABLE = """[...document.querySelectorAll('#pools tr')].slice(1)
  .map((row) => [...row.children].map((cell) => cell.innerText.replaceAll(',', '')))"""
SHAPES = "[document.querySelectorAll('path.full').length, document.querySelectorAll('.dots').length]"


def draw(browser, text):
    Path("out.txt").write_text(text)
    tool("chart", "out.txt", "-o", "page.html")
    browser.open("page.html")


def held_and_payload(text):
    """By pool, from the columns of the summary."""
    rows = [re.split("  +", line) for line in tool("report", given=text).splitlines()[1:]]
    return {row[0]: [int(row[4]), int(row[5])] for row in rows}


def test_reports(browser, before, now):
    rounds = [held_and_payload(text) for text in (before, now)]
    draw(browser, before + "\n" + now)

    def expect(at, what):
        rows = [[name, *map(str, rounds[at][name]), str(max(r[name][0] for r in rounds)),
                 str(rounds[1][name][0] - rounds[0][name][0])] for name in rounds[0]]
        rows.sort(key=lambda row: -int(row[3]))
        sums = [str(sum(values)) for values in zip(*(map(int, row[1:]) for row in rows))]
        same(browser.evaluate(TABLE), [*rows, ["total", *sums[:2], "-", sums[3]]], what)
        return rows[0][0]

    largest = expect(1, "the table at the end")
    same(browser.evaluate(SHAPES), [2, 3], "two lines of each kind and the key of one")
    browser.evaluate("document.querySelector('svg').focus()")
    browser.press("ArrowLeft")
    expect(0, "the table at the start")
    browser.press("ArrowDown")
    same(browser.evaluate("document.querySelector('#caption strong').innerText"), largest, "picked")
    same(browser.evaluate(SHAPES), [1, 2], "the lines of one pool")


def test_trace(browser):
    """The second pool ends, and another one takes its address."""
    lines = ["zvpt:c:a0", "zvpt:c:b0", "zvpt:a:b0:100:70", "zvpt:a:a0:200:30", "zvpt:d:b0",
             "zvpt:c:b0", "zvpt:a:b0:100:7", "zvpt:f:a0:200:"]
    draw(browser, "\n".join([*lines, ""]))
    same(browser.evaluate(TABLE), [["b0", "-", "70", "70"], ["a0", "0", "30", "0"],
                                   ["b0", "7", "7", "7"], ["total", "7", "-", "7"]], "the table")
    tool("trace", "--massif-pools", "massif", given="\n".join([*lines, ""]))
    bytes_of = [re.findall("mem_heap_B=(.*)", Path(f"massif.{i}").read_text()) for i in (1, 2, 3)]
    same(bytes_of, [["0", "0", "0", "30", "30", "30", "30", "0"], ["0", "70", "70"], ["0", "7", "7"]],
         "live bytes of each pool for ms_print")


half_time, end = Work(7, 3000, names=("</script><b>", "second")).reports
with tempfile.TemporaryDirectory() as folder, Browser(sys.argv[3]) as chromium, chdir(folder):
    test_reports(chromium, half_time, end)
    test_trace(chromium)
    same(chromium.messages, [], "messages in the console")
    same(run(PROGRAM, "chart", "-o", "-", given="nothing\n")[1:],
         ("vokmempool: standard input: there is neither a report nor a trace line in it\n", 1), "nothing to draw")
