#!/bin/sh
# test-aarch64.sh [SONG...]: builds for AArch64 and runs the tests there, under qemu; among them the
# one that compares each result with this machine's. SONGs, in any format that ffmpeg reads, are
# compared as well.
set -eu
missing=
for program in aarch64-linux-gnu-g++:g++-aarch64-linux-gnu qemu-aarch64:qemu-user \
    cmake:cmake ninja:ninja-build javac:default-jdk-headless; do
    command -v "${program%%:*}" >/dev/null || missing="$missing ${program#*:}"
done
if [ -n "$missing" ]; then
    [ "$(id -u)" = 0 ] || { echo "test-aarch64.sh: install first:$missing" >&2; exit 1; }
    apt-get -qq update
    # shellcheck disable=SC2086 # the packages are words
    DEBIAN_FRONTEND=noninteractive apt-get -qq -y install $missing >/dev/null
fi

root=$(cd "$(dirname "$0")/.." && pwd)
songs=$root/build/release/results/songs
rm -rf "$songs"
mkdir -p "$songs"
for song in "$@"; do
    ffmpeg -nostdin -v error -i "$song" -c:a pcm_s16le -y "$songs/given_$(basename "$song").wav"
done
cd "$root"
scripts/aarch64-sysroot.sh

# This machine's songs and results.
cmake --preset release
cmake --build --preset release --target song_results make_song
ctest --preset release -R '^results_'

cmake --preset aarch64
cmake --build --preset aarch64
ctest --preset aarch64 -j2
