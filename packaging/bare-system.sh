# A bare Debian system to try things in, for scripts that source this from the project's folder and
# run as root. They set `log`, which takes what is said, and `fail`, which gives a reason and exits.
# shellcheck shell=bash disable=SC2154

# open_system FILE [PACKAGE,...]: the system, with more packages where they are named, is made once,
# from where this machine's apt takes its own, and kept as a tar file. It is unpacked into $root until
# the script ends. Where nothing may be mounted, mmdebstrap does without.
open_system() {
  local release sources
  system=$1
  root=$(mktemp -d "$PWD/build/root.XXXXXX")
  trap 'rm -rf "$root" "$system.new"' EXIT
  if ! [ "$system" -nt "$0" ]; then
    # shellcheck source=/dev/null
    release=$(. /etc/os-release && echo "$VERSION_CODENAME")
    mapfile -t sources < <(grep -lsw "$release" /etc/apt/sources.list /etc/apt/sources.list.d/*.{list,sources})
    [ ${#sources[@]} -gt 0 ] || fail "apt has no sources of $release"
    mmdebstrap --variant=minbase ${2:+"--include=$2"} --format=tar \
      "$release" "$system.new" "${sources[@]}" >"$log" 2>&1 ||
      fail "no system could be made (it takes a network), see $log"
    mv "$system.new" "$system"
  fi
  tar --extract --file "$system" --directory "$root"
  enter=(chroot "$root")
  : >"$log"
}

# One command in the system, in the home of its root.
within() {
  echo "+ $1" >>"$log"
  "${enter[@]}" env -i HOME=/root LC_ALL=C.UTF-8 PATH=/usr/sbin:/usr/bin:/sbin:/bin \
    bash -euc "cd; $1" </dev/null 2>>"$log"
}

step() {
  within "$1" >>"$log" || fail "this failed, see $log: $1"
}
