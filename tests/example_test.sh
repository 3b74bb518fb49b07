#!/usr/bin/env bash
# Runs an example by the command given as arguments, and compares what it prints with its golden
# text, or writes that anew if VOK_MEMPOOL_APPROVE is set. An address becomes a number, the same at
# each place, and the sizes that go with the width of a pointer become an N.
set -uo pipefail
name=$(basename "${@: -1}" .exe)
golden=$(dirname "$0")/golden/examples/$name.txt

masked() {
  tr -d '\r' |
    sed -E -e '/^zvpt:/s/:([0-9a-f]{5,})/:0x\1/g' -e 's/^( +Sizeof (Buck|    ) +: +)[0-9]+$/\1N/' |
    awk '{
      for (rest = $0; match(rest, /0x[0-9a-f]+/); rest = substr(rest, RSTART + RLENGTH)) {
        address = substr(rest, RSTART, RLENGTH)
        if (!(address in number)) number[address] = "A" ++count
        printf "%s%s", substr(rest, 1, RSTART - 1), number[address]
      }
      print rest
    }'
}

if [ -n "${VOK_MEMPOOL_APPROVE-}" ]; then
  "$@" | masked >"$golden"
else
  "$@" | masked | diff -u "$golden" -
fi
