#!/usr/bin/env bash
# scripts/coverage.sh
# Builds with counters, runs the tests and prints how many lines and branches of the library and of
# the codec library's stand-in they executed. What they did not is listed in
# docs/figures/uncovered.txt. Fails when too little is covered, or when lines or branches that are not
# have no reason in docs/figures/explained.txt.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
build=${TAVO_COVERAGE_BUILD:-build/coverage}

for tool in cmake ninja g++ gcov gcovr ffmpeg; do
  command -v "$tool" >/dev/null ||
    { echo "coverage: $tool is missing: run scripts/setup.sh build java tests measure" >&2; exit 1; }
done

cmake --preset coverage -B "$build" >/dev/null
cmake --build "$build"
find "$build" -name '*.gcda' -delete
# Left out: what looks at the repository and the library as files.
ctest --test-dir "$build" --parallel "$(nproc)" --output-on-failure --no-tests=error \
  -E '^(repo|packaging|android)[._]'
gcovr --root . --object-directory "$build" --exclude-throw-branches --exclude-unreachable-branches \
  --filter '(core|media_source|pcm|highlight|beat|dsp|jni|desktop/wexaaudio)/' \
  --filter 'common/worker_group' --json "$build/coverage.json" "$build"
python3 scripts/uncovered.py "$build/coverage.json"
