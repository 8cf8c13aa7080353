#!/usr/bin/env bash
# scripts/matrix.sh [--tests] [NAME]...
# Builds the library with every compiler, optimisation level and sanitizer below and compares the
# results of songs in every format, all digits of milliseconds and BPM, with those of the first
# build. With --tests each build's own tests run as well (hours). NAME: only these builds, compared
# with the first. Prints a row for each; fails when a result differs or a test fails.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
root=$PWD
out=${TAVO_MATRIX_BUILD:-$root/build/matrix}

builds=( # name compiler options sanitizers
  "gcc0 g++ -O0 -" "gcc1 g++ -O1 -" "gcc2 g++ -O2 -" "gcc3 g++ -O3 -"
  "clang0 clang++ -O0 -" "clang1 clang++ -O1 -" "clang2 clang++ -O2 -" "clang3 clang++ -O3 -"
  "asan g++ -O1 address,leak" "ubsan g++ -O1 undefined,float-cast-overflow" "tsan g++ -O1 thread"
  "clang_asan clang++ -O1 address" "clang_ubsan clang++ -O1 undefined,float-cast-overflow"
  "clang_tsan clang++ -O1 thread" "valgrind g++ -O1 memcheck"
)
tests=
chosen=" "
while [[ $# -gt 0 ]]; do
  case $1 in
    --tests) tests=1 ;;
    -*) echo "usage: scripts/matrix.sh [--tests] [NAME]...; names: ${builds[*]%% *}" >&2; exit 2 ;;
    *)
      [[ " ${builds[*]%% *} " == *" $1 "* ]] ||
        { echo "matrix: no build '$1'; there are: ${builds[*]%% *}" >&2; exit 2; }
      chosen+="$1 " ;;
  esac
  shift
done
[[ $chosen != " " ]] || chosen=" ${builds[*]%% *} "
for tool in cmake ninja g++ clang++ valgrind ffmpeg flac lame oggenc; do
  command -v "$tool" >/dev/null ||
    { echo "matrix: $tool is missing: run scripts/setup.sh build java tests measure" >&2; exit 1; }
done

export ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1
songs=$out/songs
first=$out/gcc0

# Songs, once: every way of converting the rate, then every format; some short for valgrind.
make_songs() {
  [[ ! -e $out/songs.made ]] || return 0
  local name
  rm -rf "$songs" "$out/short"
  mkdir -p "$songs" "$out/short"
  cmake --build "$first" --target make_song make_accented_song
  cmake -DMAKE_SONG="$first/bin/make_song" -DDIRECTORY="$songs" -P tests/results/songs.cmake
  tests/formats/make_songs.sh "$first/bin/make_accented_song" "$out/formats"
  tests/support/make_fixtures.sh "$first/bin/make_song" "$out/fixtures"
  cp "$out"/formats/[a-z]*.* "$songs"
  cp "$songs/own_rate_100.wav" "$out/short"
  for name in wide.flac mono.mp3 layer2.mp2 lsf.mp3 core.aac six.aac fragmented.mp4 layer3.mp4 \
    other.ogg mono.ogg; do
    cp "$out/fixtures/$name" "$songs"
  done
  for name in mono.flac lsf.mp3 core.aac layer3.mp4 other.ogg; do
    cp "$out/fixtures/$name" "$out/short"
  done
  touch "$out/songs.made"
}

# Runs the representative programs under valgrind, with one job of each format and mode, and counts
# them in $count and $bad.
memcheck() { # memcheck BUILD
  local run=(valgrind --quiet --error-exitcode=99 --leak-check=full --errors-for-leak-kinds=definite)
  local programs=(test_{fft,dft,peaks,sort,stats,mel,matrix} test_{valleys,search,region,tune,position}
    test_{power_envelope,beat,stitch,decode_run,from_highlight,resample_block,resample_sinc})
  cmake --build "$1" --target "${programs[@]}" song_results
  local program
  for program in "${programs[@]}"; do
    count=$((count + 1))
    # Left out: what walks through minutes of signal or measures time.
    "${run[@]}" "$1/bin/$program" --gtest_brief=1 --gtest_filter="-$slow" || bad=$((bad + 1))
  done
  "${run[@]}" "$1/bin/song_results" "$out/short" "$1/results.txt"
}
slow='*Every*:*Random*:*Long*:*Huge*'

failed=()
for line in "${builds[@]}"; do
  read -r name compiler options check <<<"$line"
  [[ $name == gcc0 || $chosen == *" $name "* ]] || continue
  build=$out/$name
  start=$SECONDS
  sanitize=$check
  [[ $check != - && $check != memcheck ]] || sanitize=
  echo "== $name: $compiler $options $check"
  cmake -S . -B "$build" -G Ninja -DCMAKE_CXX_COMPILER="$compiler" -DCMAKE_BUILD_TYPE=Release \
    -DCMAKE_CXX_FLAGS_RELEASE="$options -g1" -DTAVO_SANITIZE="$sanitize" \
    -DTAVO_BUILD_CLI=OFF -DTAVO_BUILD_JAVA=OFF >/dev/null
  cmake --build "$build" --target song_results
  make_songs

  count=0 bad=0 results=different here=$songs
  rm -f "$build/results.txt"
  if [[ $check == memcheck ]]; then
    here=$out/short
    memcheck "$build" || echo "$name: song_results failed" >&2
  else
    "$build/bin/song_results" "$here" "$build/results.txt" || echo "$name: song_results failed" >&2
  fi
  if [[ $name == gcc0 ]]; then
    "$build/bin/song_results" "$out/short" "$out/short.txt"
    cp "$build/results.txt" "$out/songs.txt"
    [[ $chosen == *" $name "* ]] || continue
  fi
  ! cmp "$out/$(basename "$here").txt" "$build/results.txt" || results=identical

  if [[ -n $tests && $check != memcheck ]]; then
    cmake --build "$build"
    ctest --test-dir "$build" --parallel "$(nproc)" --no-tests=error -E '^(repo|packaging|android)[._]' \
      --output-junit "$build/tests.xml" --output-on-failure || true
    count=$(grep -c '<testcase ' "$build/tests.xml")
    bad=$(grep -c '<failure ' "$build/tests.xml" || true)
  fi
  echo "figure matrix compiler=$compiler options=$options check=$check" \
    "songs=$(find "$here" -type f | wc -l) tests=$count failed_tests=$bad results=$results"
  echo "== $name took $((SECONDS - start)) s"
  [[ $results == identical && $bad -eq 0 ]] || failed+=("$name")
done
if [[ ${#failed[@]} -gt 0 ]]; then
  echo "matrix: failed: ${failed[*]}" >&2
  exit 1
fi
