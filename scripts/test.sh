#!/usr/bin/env bash
# scripts/test.sh
# Installs missing packages, checks the formatting, builds, and runs clang-tidy and every test, including the fuzzers'
# corpora, in the release build and under the sanitizers. Ends with CTest's summary. Fails if any step fails.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

# The first builds need half of the packages. The others are installed meanwhile.
if [[ $(id -u) -eq 0 ]]; then bash scripts/setup.sh first; else bash scripts/setup.sh; fi
bash scripts/setup.sh &
setup=$!
trap wait EXIT

echo "== formatting"
bash scripts/format.sh --check

failed=() # steps, and the tests in them
for preset in asan tsan release; do
  echo "== $preset: build"
  [[ $preset != release ]] || wait $setup
  cmake --preset "$preset" >/dev/null
  cmake --build --preset "$preset"
done
echo "== clang-tidy"
bash scripts/tidy.sh || failed+=("clang-tidy")
for preset in release asan tsan; do
  echo "== $preset: tests"
  # one more than there are processors, because some tests wait for a browser or a timer
  ctest --preset "$preset" --parallel $(($(nproc) + 1)) ||
    failed+=("$preset: $(cut -d: -f2- "build/$preset/Testing/Temporary/LastTestsFailed.log" | paste -sd ' ')")
done
if [[ ${#failed[@]} -gt 0 ]]; then
  echo "failed:" >&2
  printf '  %s\n' "${failed[@]}" >&2
  exit 1
fi
