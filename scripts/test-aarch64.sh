#!/bin/sh
# test-aarch64.sh [SONG...]: builds for AArch64 and runs the tests, including the golden results, under qemu. If
# SONGs are given, in any format that ffmpeg reads, also compares their results with those of a native build.
set -eu
for song in "$@"; do
  set -- "$@" "$(realpath "$song")"
  shift
done
cd "$(dirname "$0")/.."
bash scripts/setup.sh
missing=
for program in aarch64-linux-gnu-g++:g++-aarch64-linux-gnu qemu-aarch64:qemu-user; do
  command -v "${program%%:*}" >/dev/null || missing="$missing ${program#*:}"
done
if [ -n "$missing" ]; then
  [ "$(id -u)" = 0 ] || { echo "test-aarch64.sh: install first:$missing" >&2; exit 1; }
  apt-get -qq update
  # shellcheck disable=SC2086 # word splitting is intended
  DEBIAN_FRONTEND=noninteractive apt-get -qq -y install $missing >/dev/null
fi
scripts/aarch64-sysroot.sh

# The tests use the songs that this machine encodes.
cmake --preset release
cmake --build --preset release --target song_results make_song
ctest --preset release -R '^songs$'

cmake --preset aarch64
cmake --build --preset aarch64
ctest --preset aarch64 -j2

[ $# -gt 0 ] || exit 0
given=build/aarch64/given
rm -rf "$given"
mkdir -p "$given"
for song in "$@"; do
  ffmpeg -nostdin -v error -i "$song" -c:a pcm_s16le -y "$given/$(basename "$song").wav"
done
build/release/bin/song_results "$given" >"$given.json"
qemu-aarch64 -L build/aarch64-sysroot build/aarch64/bin/song_results "$given" "$given.json"
