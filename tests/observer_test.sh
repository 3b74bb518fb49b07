#!/usr/bin/env bash
# One library under three checkers: each fault is found by those that can find it, in their words, and
# what is no fault by none. Arguments: pool_child, and the same built with the address sanitizer.
set -uo pipefail
plain=$1 sanitized=$2
export ZOR_VOK_MEMPOOL_ON=1 ASAN_OPTIONS=detect_leaks=1
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
failed=0
fail() { echo "$*"; cat "$scratch/err"; failed=1; }

# CHECKER SCRIPT OUTPUT [FOUND...]: what the checker must say, as patterns; with none it must be silent.
expect() {
  local command=(valgrind -q --leak-check=full --error-exitcode=9 "$plain") found=9 pattern
  [ "$1" = memcheck ] || { command=("$sanitized") found=1; }
  "${command[@]}" "pool a; $2" >"$scratch/out" 2>"$scratch/err"
  local status=$?
  [ $status -eq $(($# > 3 ? found : 0)) ] || fail "$1, $2: status $status"
  [ $# -gt 3 ] || [ ! -s "$scratch/err" ] || fail "$1, $2: not silent"
  [[ $(tr '\n' ' ' <"$scratch/out") = $3 ]] || fail "$1, $2: printed $(cat "$scratch/out")"
  for pattern in "${@:4}"; do
    grep -Eq "$pattern" "$scratch/err" || fail "$1, $2: no \"$pattern\""
  done
}

leak='alloc 11; alloc 100; free 1; alloc 200; free 2; alloc 10; forget; alloc 5000; forget'
# A record of 9 bytes has 12: the first fault is in its slack.
expect memcheck 'alloc 9; write 9' '' 'Invalid write of size 1' \
  '0 bytes after a block of size 9 client-defined'
expect memcheck 'alloc 10; write -1' '' '1 bytes before a block of size 10 client-defined'
expect memcheck 'alloc 5000; write 5000' '' '0 bytes after a block of size 5,000 client-defined'
expect memcheck 'alloc 10; alloc 10; free 1; write 0' 'freed ' 'Invalid write of size 1' '::Write\('
expect memcheck 'alloc 10; clear; write 0' '' '0 bytes inside a block of size 10 free.d' \
  'Mgr::Clear|BucketMgr::Clear'
ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS=1 expect memcheck "$leak" 'freed freed ' ' 10 bytes in 1 blocks are definitely lost' \
  ' 5,000 bytes in 1 blocks are definitely lost' '::Alloc\(.*pool_client.cpp'
[ "$(grep -c 'definitely lost' "$scratch/err")" -eq 2 ] || fail "leaks that are none"
# A granule that is open in part has no name of its own there.
expect asan 'alloc 9; write 9' '' 'AddressSanitizer: (use-after-poison|unknown-crash)' ' in Write'
expect asan 'alloc 5000; write 5000' '' 'heap-buffer-overflow'
expect asan 'alloc 10; alloc 10; free 1; write 0' '*' 'use-after-poison' ' in Write'
expect asan 'alloc 10; clear; write 0' '' 'heap-use-after-free' 'freed by'
for checker in memcheck asan; do
  expect $checker 'alloc 13; alloc 5000; report; free 0; free 1; alloc 996; clear; alloc 8; drop' '*freed freed '
  expect $checker 'alloc 10; alloc 10; free 1; free 1; ask 1; drop' 'freed refused 00 '
done
ZOR_VOK_MEMPOOL_ON=0 # a second Free is the heap's to find
expect memcheck 'alloc 10; free 0; free 0' '*' 'Invalid free' '::Free\('
expect asan 'alloc 10; free 0; free 0' '*' 'attempting double-free' ' in Free'

# The records are what it counts, and not the blocks that they lie in.
export ZOR_VOK_MEMPOOL_ON=1 ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS=1
heaptrack -o "$scratch/trace" "$plain" "pool a; $leak" >"$scratch/err" 2>&1 &&
  heaptrack_print -l 1 -a 0 -p 0 -T 0 "$scratch"/trace.* >"$scratch/err" 2>/dev/null &&
  grep -A2 -E '^21B leaked over' "$scratch/err" | grep -q 'BucketMgr::Alloc' &&
  ! grep -q 'Bucket::Create' "$scratch/err" || fail "heaptrack: not 10 and 11 bytes of records alone"
exit $failed
