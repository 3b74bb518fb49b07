#!/usr/bin/env bash
# Runs word-index over two small texts, on pools and on the heap, and compares all that it finds with
# the golden texts; then its ways to fail. The command that starts it is given as arguments.
set -euo pipefail
word_index=("$@")
cd "$(dirname "$0")/golden/word-index"

# What differs from run to run and from pools to heap is left out.
found() { "${word_index[@]}" "$@" | tr -d '\r' | grep -Ev '^(seconds|peak|pooling|a )'; }

for heap in "" --heap; do
  found $heap --query pool --query BUCKETS --query only --query t --query zebra first.txt second.txt |
    diff -u expected.txt -
  found $heap --drop second.txt#2 --repeat 3 --query pool first.txt second.txt |
    diff -u expected-repeat.txt -
done
[ "$(found --report first.txt | grep -c '^MemPool::Mgr ')" = 3 ] || { echo "no report"; exit 1; }
found --detailed first.txt second.txt | grep ' ALL RECORDS MAP (' >/dev/null
while read -r expected arguments; do
  status=0
  # shellcheck disable=SC2086
  "${word_index[@]}" $arguments >/dev/null 2>&1 || status=$?
  [ $status = "$expected" ] || { echo "status $status, expected $expected: $arguments"; exit 1; }
done <<'END'
0 --help
1 no-such-text.txt
1 --drop third.txt first.txt
2 --repeat 0 first.txt
2 --no-such-option
END
