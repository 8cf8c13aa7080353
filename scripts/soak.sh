#!/usr/bin/env bash
# scripts/soak.sh [--minutes N] [STEP]...
# The long tier of the counted trials: every place, every cycle, long fuzzing. Takes hours. Each
# step's figures replace docs/figures/STEP.txt when it has succeeded, and docs/RELIABILITY.md is
# written anew from all of them. Without STEP, all steps; --minutes is the time for the fuzzers.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

steps=(faults codec_faults damage lifecycle lifecycle_tsan limits fuzzing matrix matrix_tests coverage mutation)
minutes=60
chosen=()
while [[ $# -gt 0 ]]; do
  case $1 in
    --minutes) minutes=${2:?--minutes needs a number}; shift 2 ;;
    -*) echo "usage: scripts/soak.sh [--minutes N] [STEP]...; steps: ${steps[*]}" >&2; exit 2 ;;
    *)
      [[ " ${steps[*]} " == *" $1 "* ]] || { echo "soak: no step '$1'; steps: ${steps[*]}" >&2; exit 2; }
      chosen+=("$1"); shift ;;
  esac
done
[[ ${#chosen[@]} -gt 0 ]] || chosen=("${steps[@]}")

bash scripts/setup.sh build java tests fuzz measure
mkdir -p build/soak docs/figures

trial() { # trial PRESET PROGRAM: all cases of a trial program in its full tier
  cmake --preset "$1" >/dev/null &&
    cmake --build --preset "$1" --target "$2" make_song wexaaudio tavo log &&
    ctest --preset "$1" -R '^(codec_fixtures|fault_songs)$' &&
    TAVO_TRIALS=full "build/$1/bin/$2"
}

measure() { # measure STEP
  case $1 in
    faults | codec_faults | limits) trial release "trial_$1" ;;
    lifecycle) trial release trial_lifecycle ;;
    lifecycle_tsan) trial tsan trial_lifecycle ;;
    damage) trial asan trial_damage ;;
    fuzzing) bash scripts/fuzz.sh --aims "$minutes" ;;
    matrix) bash scripts/matrix.sh ;;
    matrix_tests) bash scripts/matrix.sh --tests ;;
    coverage) bash scripts/coverage.sh ;;
    mutation) python3 scripts/mutation.py --count 300 --seed 1 --jobs "$(nproc)" ;;
  esac
}

failed=()
for step in "${chosen[@]}"; do
  log=build/soak/$step.log
  echo "== $step (into $log)"
  start=$SECONDS
  if measure "$step" >"$log" 2>&1 && grep -q '^figure ' "$log"; then
    {
      echo "# $((SECONDS - start)) s on $(nproc) processors, of $(git describe --always --dirty)"
      grep '^figure ' "$log"
    } >"docs/figures/$step.txt"
    sed 1d "docs/figures/$step.txt"
  else
    failed+=("$step")
    tail -n 20 "$log" >&2
  fi
done

if [[ ${#failed[@]} -gt 0 ]]; then
  echo "soak: failed: ${failed[*]}; their old figures stay" >&2
  exit 1
fi
python3 scripts/reliability.py
