#!/usr/bin/env bash
# scripts/matrix.sh [NAME]...
# Builds the library with every compiler, optimisation level and sanitizer listed below; NAMEs select some of these
# builds. Fails if a build's results (in ms and BPM) are not identical to the golden ones.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."

builds=( # name compiler options sanitizers
  "gcc0 g++ -O0" "gcc1 g++ -O1" "gcc2 g++ -O2" "gcc3 g++ -O3"
  "clang0 clang++ -O0" "clang1 clang++ -O1" "clang2 clang++ -O2" "clang3 clang++ -O3"
  "asan g++ -O1 address,leak" "ubsan g++ -O1 undefined,float-cast-overflow" "tsan g++ -O1 thread"
  "clang_asan clang++ -O1 address" "clang_ubsan clang++ -O1 undefined,float-cast-overflow"
  "clang_tsan clang++ -O1 thread" "valgrind g++ -O1"
)
bash scripts/setup.sh build tests measure
failed=()
for line in "${builds[@]}"; do
  read -r name compiler options sanitizers <<<"$line"
  [[ $# -eq 0 || " $* " == *" $name "* ]] || continue
  build=build/matrix/$name
  cmake -S . -B "$build" -G Ninja -DCMAKE_CXX_COMPILER="$compiler" -DCMAKE_BUILD_TYPE=Release \
    -DCMAKE_CXX_FLAGS_RELEASE="$options -g1" -DTAVO_SANITIZE="$sanitizers" \
    -DTAVO_BUILD_CLI=OFF -DTAVO_BUILD_JAVA=OFF >/dev/null
  cmake --build "$build" --target song_results >"$build.log"
  run=()
  if [[ $name == valgrind ]]; then
    # glibc's loader compares names eight bytes at a time and reads past the end of short ones.
    printf '{\n loader\n Memcheck:Addr8\n obj:*/ld-linux*\n obj:*/ld-linux*\n}\n' >"$build.supp"
    run=(valgrind --quiet --error-exitcode=99 --leak-check=full --suppressions="$build.supp")
  fi
  result=identical
  "${run[@]}" "$build/bin/song_results" tests/results/songs tests/results/expected.json >>"$build.log" 2>&1 ||
    { result=different failed+=("$name"); tail -n 20 "$build.log"; }
  echo "$name: $compiler $options $sanitizers: $result"
done
[[ ${#failed[@]} -eq 0 ]] || { echo "matrix: failed: ${failed[*]}" >&2; exit 1; }
