#!/usr/bin/env bash
# Runs word-index over two small texts, on pools and on the heap, and compares all that it finds with
# the golden texts; then its ways to fail. The command that starts it is given as arguments.
set -uo pipefail
word_index=("$@")
cd "$(dirname "$0")/golden/word-index" || exit 1
failed=0

# What differs from run to run and from pools to heap is left out.
found() { "${word_index[@]}" "$@" | tr -d '\r' | grep -Ev '^(seconds|peak|pooling|a )'; }

same() { # EXPECTED ARGUMENT...
  local expected=$1
  shift
  found "$@" | diff -u "$expected" - || failed=1
}

status() { # STATUS ARGUMENT...
  local expected=$1
  shift
  "${word_index[@]}" "$@" >/dev/null 2>&1
  local status=$?
  [ $status = "$expected" ] || { echo "status $status, expected $expected: $*"; failed=1; }
}

for heap in "" --heap; do
  same expected.txt $heap --query pool --query BUCKETS --query only --query t --query zebra \
    first.txt second.txt
  same expected-repeat.txt $heap --drop second.txt#2 --repeat 3 --query pool first.txt second.txt
done
[ "$(found --report first.txt | grep -c '^MemPool::Mgr ')" = 3 ] || { echo "no report"; failed=1; }
[ "$(found --detailed first.txt second.txt | grep -c ' ALL RECORDS MAP (')" -gt 0 ] ||
  { echo "no detailed report"; failed=1; }
status 0 --help
status 1 no-such-text.txt
status 1 --drop third.txt first.txt
status 2 --repeat 0 first.txt
status 2 --repeat junk first.txt
status 2 --no-such-option
exit $failed
