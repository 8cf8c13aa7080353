#!/usr/bin/env bash
# scripts/test-package.sh
# Before a release, as root, a few minutes: makes the packages; in a clean Debian 12 of its own,
# installs the .deb with apt, uses the command, builds a program against it, removes it again; then
# uses the .tar.gz there.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
if [[ $(id -u) -ne 0 ]]; then
  echo "test-package: only root can make a system to install into" >&2
  exit 1
fi
bash scripts/setup.sh build java tests package

build=$PWD/build/package
rm -rf "$build/packages"
cmake --preset release -B "$build" -DTAVO_BUILD_TESTS=OFF >/dev/null
cmake --build "$build"
cpack --config "$build/CPackConfig.cmake"
deb=("$build"/packages/*.deb)
tar=("$build"/packages/*.tar.gz)
dpkg-deb --field "${deb[0]}" Package Version Depends

root=$(mktemp -d)
log=$(mktemp)
trap 'umount "$root/proc" 2>/dev/null || true; rm -rf --one-file-system "$root" "$log"' EXIT
chmod 755 "$root"
quietly() {
  "$@" >"$log" 2>&1 || { cat "$log" >&2; exit 1; }
}
echo "== a clean system"
quietly debootstrap --variant=minbase bookworm "$root"
mount -t proc proc "$root/proc" # the loader learns there where a program lies
inside() {
  env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin LC_ALL=C.UTF-8 DEBIAN_FRONTEND=noninteractive \
    chroot "$root" "$@"
}
fail() {
  echo "test-package: $*" >&2
  exit 1
}
traces() { # what a removal must take away
  inside find / -xdev -path /proc -prune -o -name '*tavo*' ! -path '/try/*' -print
}

mkdir "$root/try"
cp "${deb[0]}" "$root/try/tavo.deb"
cp "${tar[0]}" "$root/try/tavo.tar.gz"
# Two hits a second, loud from 15 s on.
ffmpeg -v error -f lavfi -i \
  'aevalsrc=sin(2*PI*220*t)*(0.1+0.6*gt(t\,15))*exp(-8*mod(t\,0.5)):d=40:s=44100' "$root/try/song.flac"
expected=$(cd "$root/try" && "$build/bin/tavo" --format json --length 20 song.flac)
[[ $expected == *'"status":"ok"'* ]] || fail "the build gives $expected"
same() { # same COMMAND: its result is the build's
  local got
  got=$(inside sh -c "cd /try && $1 --format json --length 20 song.flac")
  [[ $got == "$expected" ]] || fail "$1 gives $got instead of $expected"
  echo "$1: the build's result"
}

echo "== the .deb"
quietly inside apt-get update
quietly inside apt-get install -y --no-install-recommends /try/tavo.deb
same tavo
for file in /usr/share/man/man1/tavo.1 /usr/share/bash-completion/completions/tavo; do
  [[ -s $root$file ]] || fail "$file is missing"
done
cache=$(inside ldconfig -p)
[[ $cache == *libtavo.so.1* ]] || fail "the loader does not know libtavo.so.1"
[[ $cache != *liblog.so* && $cache != *libwexaaudio* ]] || fail "a private library is everybody's"

quietly inside apt-get install -y --no-install-recommends gcc libc6-dev pkg-config
# shellcheck disable=SC2016 # for the shell inside
inside sh -c 'cc /usr/share/doc/tavo/examples/analyze_file.c -o /try/analyze_file \
  $(pkg-config --cflags --libs tavo) -pthread'
lines=$(inside /try/analyze_file /try/song.flac 20)
highlight=${expected#*'"hl_pos_ms":'}
highlight=${highlight%%,*}
[[ $(head -n 1 <<<"$lines") == "highlight $highlight" ]] || fail "the example prints $lines"
echo "analyze_file: highlight $highlight, $(grep -c '^beat ' <<<"$lines") beats"

[[ -n $(traces) ]] || fail "a removal would not be seen"
quietly inside apt-get purge -y tavo
left=$(traces)
[[ -z $left ]] || fail "left behind: $left"
echo "purged: nothing left"

echo "== the .tar.gz"
inside mkdir /try/anywhere
inside tar -xzf /try/tavo.tar.gz -C /try/anywhere --strip-components 1
same /try/anywhere/bin/tavo
echo "test-package: all well"
