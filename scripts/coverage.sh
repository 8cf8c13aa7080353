#!/usr/bin/env bash
# scripts/coverage.sh
# Builds with coverage counters, runs the tests and prints how many lines of the library and of the desktop's codec
# library they executed. Fails below 97 % of the library or 90 % of the codec library. Writes build/coverage/*.txt,
# which list the lines that were not executed.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
bash scripts/setup.sh build tests measure

cmake --preset coverage >/dev/null
cmake --build --preset coverage
find build/coverage -name '*.gcda' -delete
# Tests that only inspect files execute no lines.
ctest --preset coverage --parallel "$(nproc)" -E '^(repo|packaging|android)\.'
cover() { # cover NAME FLOOR FILTER
  echo "== $1"
  gcovr --root . --object-directory build/coverage --exclude-throw-branches --exclude-unreachable-branches \
    --filter "$3" --txt build/coverage/"$1".txt --print-summary --fail-under-line "$2" \
    build/coverage/CMakeFiles build/coverage/desktop
}
cover library 97 '(core|common|media_source|pcm|highlight|beat|dsp|jni)/'
cover codec_library 90 'desktop/wexaaudio/'
