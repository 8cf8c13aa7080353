#!/usr/bin/env bash
# scripts/test-package.sh
# For use before a release, as root; takes a quarter of an hour. Builds the Debian packages twice, in two folders, and
# compares their bytes. Runs lintian. Installs the packages with apt in a clean Debian 12, runs the command, the Python
# package and the jar, builds a program, and purges the packages. Runs the command from the .tar.gz. Builds a wheel and
# installs it in a virtual environment.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
if [[ $(id -u) -ne 0 ]]; then
  echo "test-package: run it as root" >&2
  exit 1
fi
bash scripts/setup.sh build java tests package

build=$PWD/build/package
rm -rf "$build"
debs=$build/first
for copy in first second; do # copies of the last commit
  mkdir -p "$build/$copy/tavo"
  git archive HEAD | tar -x -C "$build/$copy/tavo"
  (cd "$build/$copy/tavo" && dpkg-buildpackage -b -us -uc >"$build/$copy.log" 2>&1) ||
    { tail -n 40 "$build/$copy.log" >&2; exit 1; }
done
for deb in "$debs"/*.deb; do
  cmp "$deb" "$build/second/${deb##*/}"
done
(cd "$debs" && sha256sum ./*.deb)
lintian --allow-root --fail-on error,warning "$debs"/*.changes

tree=$debs/tavo/build/debian
cpack -G TGZ --config "$tree/CPackConfig.cmake" -B "$build/packages" >/dev/null
tar=("$build"/packages/*.tar.gz)

root=$(mktemp -d)
log=$(mktemp)
trap 'umount "$root/proc" 2>/dev/null || true; rm -rf --one-file-system "$root" "$log"' EXIT
chmod 755 "$root"
quietly() {
  "$@" >"$log" 2>&1 || { cat "$log" >&2; exit 1; }
}
echo "== a clean system"
quietly debootstrap --variant=minbase bookworm "$root"
mount -t proc proc "$root/proc" # programs find their own path there
inside() {
  env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin LC_ALL=C.UTF-8 DEBIAN_FRONTEND=noninteractive \
    chroot "$root" "$@"
}
fail() {
  echo "test-package: $*" >&2
  exit 1
}
traces() { # lists the files that a purge must delete
  inside find / -xdev -path /proc -prune -o -name '*tavo*' ! -path '/try/*' -print
}

mkdir "$root/try"
mkdir "$root/try/debs"
cp "$debs"/*.deb "$root/try/debs"
rm "$root"/try/debs/*-dbgsym_*
cp "${tar[0]}" "$root/try/tavo.tar.gz"
# Creates a song with two hits per second, loud from 15 s on.
ffmpeg -v error -f lavfi -i \
  'aevalsrc=sin(2*PI*220*t)*(0.1+0.6*gt(t\,15))*exp(-8*mod(t\,0.5)):d=40:s=44100' "$root/try/song.flac"
without_time() { # removes the processor time, which differs between runs
  sed -E 's/,?"[a-z_]*cpu[a-z_]*":[0-9.]+//'
}
expected=$(cd "$root/try" && "$tree/bin/tavo" --format json --length 20 song.flac | without_time)
[[ $expected == *'"status":"ok"'* ]] || fail "the build prints $expected"
same() { # same COMMAND: fails unless COMMAND prints the same result as the build
  local got
  got=$(inside sh -c "cd /try && $1 --format json --length 20 song.flac" | without_time)
  [[ $got == "$expected" ]] || fail "$1 prints $got instead of $expected"
  echo "$1: same result as the build"
}

echo "== the Debian packages"
quietly inside apt-get update
quietly inside apt-get install -y --no-install-recommends python3-numpy default-jre-headless
quietly inside sh -c 'apt-get install -y --no-install-recommends /try/debs/*.deb'
same tavo
same "python3 -m tavo"
inside python3 -c "import tavo; print(tavo.__version__, tavo.analyze('/try/song.flac', length=20).highlight_ms)"
inside java -Djava.library.path="/usr/lib/$(dpkg-architecture -qDEB_HOST_MULTIARCH)" -jar /usr/share/java/tavo.jar \
  --length 20 /try/song.flac
for file in /usr/share/man/man1/tavo.1.gz /usr/share/bash-completion/completions/tavo; do
  [[ -s $root$file ]] || fail "$file is missing"
done
cache=$(inside ldconfig -p)
[[ $cache == *libtavo.so.1* ]] || fail "the loader does not find libtavo.so.1"
[[ $cache != *liblog.so* && $cache != *libwexaaudio* ]] || fail "the loader finds a private library"

quietly inside apt-get install -y --no-install-recommends gcc libc6-dev pkg-config
# shellcheck disable=SC2016 # for the shell inside
inside sh -c 'cc /usr/share/doc/tavo-doc/examples/analyze_file.c -o /try/analyze_file \
  $(pkg-config --cflags --libs tavo) -pthread'
lines=$(inside /try/analyze_file /try/song.flac 20)
highlight=${expected#*'"hl_pos_ms":'}
highlight=${highlight%%,*}
grep -qx "highlight $highlight" <<<"$lines" || fail "the example prints $lines"
echo "analyze_file: highlight $highlight, $(grep -c '^beat ' <<<"$lines") beats"

[[ -n $(traces) ]] || fail "no installed file has tavo in its name, so the purge cannot be checked"
quietly inside apt-get purge -y libtavo1 tavo-doc
left=$(traces)
[[ -z $left ]] || fail "not purged: $left"
echo "purged: no file is left"

echo "== the .tar.gz"
inside mkdir /try/anywhere
inside tar -xzf /try/tavo.tar.gz -C /try/anywhere --strip-components 1
same /try/anywhere/bin/tavo
echo "== the wheel"
python=/usr/bin/python3
"$python" -m pip wheel --quiet --no-index --no-build-isolation --no-deps --wheel-dir "$build/wheel" ./python
"$python" -m venv --system-site-packages "$build/venv" # NumPy is Debian's
"$build/venv/bin/pip" install --quiet --no-index "$build"/wheel/tavo-*-py3-none-linux_*.whl
got=$(cd "$root/try" && "$build/venv/bin/tavo" --format json --length 20 song.flac | without_time)
[[ $got == "$expected" ]] || fail "the wheel prints $got instead of $expected"
(cd / && "$build/venv/bin/python" -c 'import sys, tavo; print(tavo.__file__, tavo.analyze(sys.argv[1]).highlight_ms)' \
  "$root/try/song.flac")
echo "test-package: passed"
