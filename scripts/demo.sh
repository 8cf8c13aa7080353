#!/usr/bin/env bash
# scripts/demo.sh [FILE]
# Installs missing packages, builds the release and analyses FILE, or a sample song that it generates.
set -euo pipefail
if [[ $# -gt 1 ]]; then
  echo "usage: demo.sh [FILE]" >&2
  exit 2
fi
file=${1:+$(realpath -- "$1")}
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

bash scripts/setup.sh build
quietly() {
  local log
  log=$(mktemp)
  if ! "$@" >"$log" 2>&1; then
    cat "$log" >&2
    rm -f "$log"
    exit 1
  fi
  rm -f "$log"
}
echo "Building (a minute or two the first time) ..."
quietly cmake --preset release -DTAVO_BUILD_TESTS=OFF -DTAVO_BUILD_JNI=OFF
quietly cmake --build --preset release --target tavo_command
bin=build/release/bin

quiet=
if [[ -z $file ]]; then
  file=build/release/sample.wav
  quiet=build/release/quiet.wav
  echo "Making a sample song, and the same 12 dB softer:"
  quietly g++ -std=c++17 -O2 -I. -o build/make_song \
    tests/support/make_song.cpp tests/support/song.cpp
  build/make_song "$file" --seconds 90 --bpm 120 --loud-at 30
  build/make_song "$quiet" --seconds 90 --bpm 120 --loud-at 30 --drums 0.075 --bed 0.1
fi

show() {
  echo
  printf '$'
  printf ' %q' "$bin/tavo" "$@"
  echo
  "$bin/tavo" "$@"
}
status=0
{ show --mode highlight -- "$file" ${quiet:+"$quiet"} && show -- "$file"; } || status=$?
if [[ $status -eq 0 ]]; then
  cat <<'END'

stream     what the file holds: its length, sample rate and channels
highlight  where the song's strongest loud passage starts: accurate to 0.4 s where the music is loud; in
           quiet music "about", a point of a 2 s grid, usually 2 to 6 s early. The last run takes the
           place where a seek to the highlight lands, in WAV a whole second
tempo      beats a minute, to the nearest step of the analysis (117, 123, ...)
beats      good places for a cut, at least 1 s apart, at least 3 s where the tempo is 95 or less: how
           many, the first and the last; --format json, csv or labels lists them all
END
fi
exit "$status"
