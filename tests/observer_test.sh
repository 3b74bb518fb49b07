#!/usr/bin/env bash
# One library under three checkers: each fault of faulty_child is found by the checkers that can find
# it, in their words, and what is no fault by none. Arguments: the program, and the same built with
# the address sanitizer.
set -uo pipefail
plain=$1 sanitized=$2
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
failed=0

memcheck() { valgrind -q --leak-check=full --error-exitcode=9 "$plain" "$1"; }
asan() { ASAN_OPTIONS=detect_leaks=1 "$sanitized" "$1"; }

# CHECKER FAULT FOUND...: what the checker must say, as patterns; with none it must be silent.
expect() {
  local checker=$1 fault=$2 pattern
  "$checker" "$fault" >"$scratch/out" 2>"$scratch/err"
  local status=$? expected=0
  [ $# -eq 2 ] || { [ "$checker" = memcheck ] && expected=9 || expected=1; }
  if [ $status -ne $expected ] || { [ $# -eq 2 ] && [ -s "$scratch/err" ]; }; then
    echo "$checker, $fault: status $status, expected $expected, said:"
    cat "$scratch/err"
    failed=1
  fi
  for pattern in "${@:3}"; do
    grep -Eq "$pattern" "$scratch/err" && continue
    echo "$checker, $fault: no \"$pattern\" in:"
    cat "$scratch/err"
    failed=1
  done
}

expect memcheck overrun 'Invalid write of size 1' '0 bytes after a block of size 9 client-defined'
expect memcheck underrun '1 bytes before a block of size 10 client-defined'
expect memcheck long-overrun '0 bytes after a block of size 5,000 client-defined'
expect memcheck use-after-free 'Invalid write of size 1' 'UseAfterFree'
expect memcheck use-after-clear '0 bytes inside a block of size 10 free.d' 'Mgr::Clear|BucketMgr::Clear'
expect memcheck leak ' 10 bytes in 1 blocks are definitely lost' \
  ' 5,000 bytes in 1 blocks are definitely lost' 'Leak.*faulty_child.cpp'
[ "$(grep -c 'definitely lost' "$scratch/err")" -eq 2 ] || { echo "leaks that are none"; failed=1; }
expect memcheck free-twice-unpooled 'Invalid free' 'FreeTwiceUnpooled'
expect asan free-twice-unpooled 'attempting double-free' 'FreeTwiceUnpooled'
# A granule that is open in part has no name of its own there.
expect asan overrun 'AddressSanitizer: (use-after-poison|unknown-crash)' 'Overrun'
expect asan long-overrun 'heap-buffer-overflow'
expect asan use-after-free 'use-after-poison' 'UseAfterFree'
expect asan use-after-clear 'heap-use-after-free' 'freed by'
for checker in memcheck asan; do
  expect $checker nothing
  expect $checker free-twice
  [ "$(cat "$scratch/out")" = 1000 ] || { echo "$checker, a second Free: $(cat "$scratch/out")"; failed=1; }
done

# The records are what it counts, and not the blocks that they lie in.
if ! heaptrack -o "$scratch/trace" "$plain" leak >"$scratch/out" 2>&1 ||
  ! heaptrack_print -l 1 -a 0 -p 0 -T 0 "$scratch"/trace.* >"$scratch/leaks" 2>/dev/null; then
  cat "$scratch/out"
  failed=1
fi
[ "$(grep -E '^1[01]B leaked over' "$scratch/leaks" | sort | cut -c 1-3 | xargs)" = '10B 11B' ] ||
  { echo "heaptrack, leak: no 10 and 11 bytes of records"; failed=1; }
grep -q 'Bucket::Create' "$scratch/leaks" && { echo "heaptrack, leak: a bucket"; failed=1; }
exit $failed
