#!/usr/bin/env bash
# scripts/fuzz.sh [--keep] SECONDS [TARGET]...
# Runs each fuzzer TARGET (all four by default) for SECONDS, and stores failing inputs in build/fuzz/findings.
# An input that takes more than 2 s fails. A fuzzer starts from its corpus (fuzz/corpus/TARGET.tar.gz and
# fuzz/corpus/TARGET) and, if its inputs are files, from the tests' short songs. --keep then finds a set of inputs with
# the same coverage and replaces the archive with the smallest of them (60 at most, below 6 KiB each).
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
keep=
if [[ ${1:-} == --keep ]]; then
  keep=1
  shift
fi
seconds=${1:-}
[[ $seconds =~ ^[0-9]+$ ]] || { sed -n '2,3s/^# //p' "$0" >&2; exit 2; }
shift
targets=("$@")
[[ $# -gt 0 ]] || targets=(source job stages toolkit)

bash scripts/setup.sh build fuzz
cmake --preset fuzz >/dev/null
cmake --build --preset fuzz
mkdir -p build/fuzz/findings
# A small quarantine and a limit on allocation size allow thousands of runs per second.
export ASAN_OPTIONS=allocator_may_return_null=1:max_allocation_size_mb=1024:quarantine_size_mb=8

fuzz() { # fuzz TARGET
  local program=(build/fuzz/bin/fuzz_"$1" -timeout=2 -rss_limit_mb=2048 -malloc_limit_mb=1024)
  local found=build/fuzz/found/"$1"
  rm -rf "$found"
  mkdir -p "$found"
  tar -xzf fuzz/corpus/"$1".tar.gz -C "$found"
  local inputs=(build/fuzz/work/"$1" "$found")
  [[ ! -d fuzz/corpus/$1 ]] || inputs+=(fuzz/corpus/"$1")
  case $1 in source | job) inputs+=(tests/results/songs) ;; esac
  mkdir -p "${inputs[0]}"
  "${program[@]}" -max_total_time="$seconds" -max_len=8192 -artifact_prefix=build/fuzz/findings/"$1"- \
    "${inputs[@]}" >build/fuzz/"$1".log 2>&1 || { tail -n 40 build/fuzz/"$1".log >&2; return 1; }
  echo "$1: $(tail -n 1 build/fuzz/"$1".log)"
  [[ -n $keep ]] || return 0
  rm -rf build/fuzz/smaller/"$1"
  mkdir -p build/fuzz/smaller/"$1"
  "${program[@]}" -merge=1 build/fuzz/smaller/"$1" "${inputs[@]}" 2>/dev/null
  find build/fuzz/smaller/"$1" -type f -size -6k -printf '%s %f\n' | sort -n | head -n 60 | cut -d' ' -f2- |
    tar -czf fuzz/corpus/"$1".tar.gz -C build/fuzz/smaller/"$1" --mtime=@0 --owner=0 --group=0 --numeric-owner -T -
}
export -f fuzz
export seconds keep
printf '%s\n' "${targets[@]}" | xargs -P "$(nproc)" -I{} bash -c 'set -euo pipefail; fuzz {}'
