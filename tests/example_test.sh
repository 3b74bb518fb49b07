#!/usr/bin/env bash
# Runs an example by the command given as arguments, and compares what it prints with its golden
# text, or writes that again if VOK_MEMPOOL_APPROVE is set. An address becomes a number, the same at
# each place, and source lines and the sizes that go with the width of a pointer become an N. With
# its pools checked, an example has no fault but the one that plants some.
set -uo pipefail
golden=$(dirname "$0")/golden/examples/$(basename "${@: -1}" .exe).txt

masked() {
  perl -pe 's/\r//; s/:([0-9a-f]{5,})/:0x$1/g if /^zvpt:/; s/0x[0-9a-f]+/$a{$&} ||= "A" . ++$n/ge;
    s/^(WARNING:\S+:) *\d+:/$1    N:/;
    s/^( +Sizeof (Buck|    ) +: +)\d+$/$1N/'
}

if [ -n "${VOK_MEMPOOL_APPROVE-}" ]; then
  "$@" | masked >"$golden"
else
  "$@" | masked | diff -u "$golden" - || exit
  case $golden in
  */10-checked.txt) ;;
  *) ! ZOR_VOK_MEMPOOL_CHECK=1 "$@" | grep '^WARNING' ;;
  esac
fi
