#!/usr/bin/env bash
# scripts/fuzz.sh [--aims] MINUTES [TARGET]...
# scripts/fuzz.sh --seconds S [TARGET]...
# scripts/fuzz.sh --keep [TARGET]...
# Replays the kept inputs of every fuzzer (fuzz/corpus/TARGET), then fuzzes the targets side by side
# on all processors: in MINUTES altogether, each with its share (with --aims a target also stops
# when it has reached its aim), or for S seconds each. What was found worth keeping stays in
# build/fuzz/work; --keep takes the smallest set of it that reaches as much into fuzz/corpus.
# Prints a row for each target. Fails when a replay or a fuzzer finds something; the input is kept
# in build/fuzz/findings.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

targets=( # name, aim in executions, share of the time, longest input in bytes; the slowest first
  "source_aac 2000000 20 4096" "source_mpeg 2000000 10 4096" "source_flac 2000000 8 4096"
  "source_mp4 2000000 8 4096" "source_ogg 2000000 4 4096" "source_wav 2000000 3 8192"
  "wav_reader 2000000 3 8192" "recognise 20000000 9 1024" "recognise_far 50000 2 1024"
  "peaks 5000000 3 1024" "sorts 5000000 3 1024" "transforms 5000000 4 1024"
  "highlight 5000000 5 1024" "converter 1000000 5 1024" "beats 1000000 6 1024" "job 50000 3 8192"
)
usage() { sed -n '2,4s/^# //p' "$0" >&2; exit 2; }
mode=minutes amount=
case ${1:-} in
  --aims | --seconds) mode=${1#--}; amount=${2:-}; shift ;;
  --keep) mode=keep; amount=0 ;;
  *) amount=${1:-} ;;
esac
[[ $amount =~ ^[0-9]+$ ]] || usage
shift
chosen=()
for name in "$@"; do
  [[ " ${targets[*]%% *} " == *" $name "* ]] || { echo "fuzz: no target '$name'; there are: ${targets[*]%% *}" >&2; exit 2; }
done
shares=0
for line in "${targets[@]}"; do
  read -r name aim share length <<<"$line"
  [[ $# -eq 0 || " $* " == *" $name "* ]] || continue
  chosen+=("$line")
  shares=$((shares + share))
done

bash scripts/setup.sh build java fuzz
cmake --preset fuzz >/dev/null
cmake --build --preset fuzz
mkdir -p build/fuzz/{work,findings,logs}
limits=(-timeout=20 -rss_limit_mb=2048 -malloc_limit_mb=1024)
# Freed memory stays barred for dozens of runs, not for thousands: fresh pages took half of the time.
export ASAN_OPTIONS=quarantine_size_mb=16${ASAN_OPTIONS:+:$ASAN_OPTIONS}

fuzz() { # fuzz NAME SECONDS RUNS LENGTH: one target; prints its row
  local name=$1 log=build/fuzz/logs/$1.log kept=fuzz/corpus/$1 inputs findings=0
  inputs=$(find "$kept" -type f 2>/dev/null | wc -l)
  [[ $inputs -gt 0 ]] || { echo "fuzz: no kept inputs in $kept" >&2; return 1; }
  mkdir -p "build/fuzz/work/$name"
  "build/fuzz/bin/fuzz_$name" "${limits[@]}" -runs=0 "-artifact_prefix=build/fuzz/findings/$name-" \
    "$kept" >"$log" 2>&1 || findings=1
  if [[ $findings -eq 0 ]]; then
    "build/fuzz/bin/fuzz_$name" "${limits[@]}" "-max_total_time=$2" "-runs=$3" "-max_len=$4" \
      -print_final_stats=1 "-artifact_prefix=build/fuzz/findings/$name-" \
      "build/fuzz/work/$name" "$kept" >"$log" 2>&1 || findings=1
  fi
  local done_runs seconds
  done_runs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log")
  seconds=$(sed -n 's/^Done .* in \([0-9]*\) second.*/\1/p' "$log")
  echo "figure fuzzing target=$name executions=${done_runs:-0} aim=$5 seconds=${seconds:-0} kept_inputs=$inputs findings=$findings"
  [[ $findings -eq 0 ]] || { echo "fuzz: $name found something:" >&2; tail -n 40 "$log" >&2; return 1; }
}

keep() { # keep NAME: the smallest set of inputs that reaches as much
  local kept=fuzz/corpus/$1 smaller=build/fuzz/smaller/$1
  rm -rf "$smaller"
  mkdir -p "$smaller" "$kept" "build/fuzz/work/$1"
  "build/fuzz/bin/fuzz_$1" "${limits[@]}" -merge=1 "$smaller" "$kept" "build/fuzz/seeds/$1" "build/fuzz/work/$1" \
    >"build/fuzz/logs/$1.log" 2>&1
  # The smallest first: long inputs that add little are not worth a place in the repository.
  rm -f "$kept"/*
  find "$smaller" -type f -size -12 -printf '%s %p\n' | sort -n | head -n 60 | cut -d' ' -f2- | xargs -r cp -t "$kept"
  echo "$1: $(find "$kept" -type f | wc -l) inputs kept"
}
export -f fuzz keep
export limits_text="${limits[*]}"

jobs=()
for line in "${chosen[@]}"; do
  read -r name aim share length <<<"$line"
  seconds=$((amount * 60 * $(nproc) * share / shares))
  runs=-1
  case $mode in
    aims) runs=$aim ;;
    seconds) seconds=$amount ;;
  esac
  jobs+=("$name $seconds $runs $length $aim")
done
if [[ $mode == keep ]]; then
  bash fuzz/seeds.sh build/fuzz/seeds
  for line in "${jobs[@]}"; do echo "${line%% *}"; done |
    xargs -P "$(nproc)" -I{} bash -c 'limits=($limits_text); keep {}'
  exit
fi
printf '%s\n' "${jobs[@]}" | xargs -P "$(nproc)" -I{} bash -c 'set -euo pipefail; limits=($limits_text); fuzz {}'
