#!/usr/bin/env bash
# scripts/tidy.sh [FILE]...
# Checks the product's sources, or the FILEs, according to .clang-tidy. Needs a configured build/release.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
if [[ $# -eq 0 ]]; then
  mapfile -t files < <(find common dsp media_source pcm highlight beat core jni cli desktop -name '*.cpp' | sort)
  set -- "${files[@]}"
fi
# Standard error only reports the number of suppressed warnings; the exit status reports errors.
printf '%s\0' "$@" | xargs -0 -P "$(nproc)" -n 2 clang-tidy -p build/release --quiet 2>/dev/null
