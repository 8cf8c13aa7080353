#!/usr/bin/env bash
# scripts/demo.sh [FILE]
# Sets up, builds the release and analyses FILE, or a sample song that it makes.
set -euo pipefail
if [[ $# -gt 1 ]]; then
  echo "usage: demo.sh [FILE]" >&2
  exit 2
fi
file=${1:+$(realpath -- "$1")}
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

bash scripts/setup.sh
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
quietly cmake --preset release
quietly cmake --build --preset release --target tavo_command make_song
bin=build/release/bin

if [[ -z $file ]]; then
  file=build/release/sample.wav
  echo "Making a sample song:"
  "$bin/make_song" "$file" --seconds 90 --bpm 120 --loud-at 30
fi

echo
echo "\$ $bin/tavo --length 30 $file"
status=0
"$bin/tavo" --length 30 -- "$file" || status=$?
echo
if [[ $status -eq 0 ]]; then
  cat <<'END'
stream     what the file holds: its length, sample rate and channels
highlight  where the song's strongest loud passage starts, and 30 s from there (--length)
tempo      beats a minute
beats      how many were found from the highlight on, the first and the last of them;
           --format json, csv or labels lists them all
END
fi
exit "$status"
