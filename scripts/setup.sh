#!/usr/bin/env bash
# scripts/setup.sh [build|tests|fuzz|measure|package]...
# Installs the Debian packages that are missing, for building and testing by default. Says nothing
# when none is.
set -euo pipefail

build=(
  g++ cmake ninja-build pkg-config
  libavcodec-dev libavformat-dev libavutil-dev libogg-dev
  libcli11-dev nlohmann-json3-dev
  default-jdk-headless
)
tests=(
  libgtest-dev libbenchmark-dev
  python3 clang-format
  ffmpeg flac lame vorbis-tools
  doxygen groff-base
)
fuzz=(clang libclang-rt-14-dev)
measure=(clang libclang-rt-14-dev gcovr valgrind)
package=(dpkg-dev file debootstrap) # scripts/test-package.sh

wanted=()
for group in "${@:-build tests fuzz}"; do
  for name in $group; do
    case $name in
      build) wanted+=("${build[@]}") ;;
      tests) wanted+=("${tests[@]}") ;;
      fuzz) wanted+=("${fuzz[@]}") ;;
      measure) wanted+=("${measure[@]}") ;;
      package) wanted+=("${package[@]}") ;;
      *) echo "setup: no group '$name'; groups: build, tests, fuzz, measure, package" >&2; exit 2 ;;
    esac
  done
done

if ! command -v dpkg-query >/dev/null; then
  echo "setup: this is not a Debian system; needed are: ${wanted[*]}" >&2
  exit 1
fi

missing=()
for name in "${wanted[@]}"; do
  state=$(dpkg-query -W -f '${db:Status-Status}' "$name" 2>/dev/null || true)
  [[ $state == *installed* && $state != *not-installed* ]] || missing+=("$name")
done
[[ ${#missing[@]} -eq 0 ]] && exit 0

if [[ $(id -u) -ne 0 ]]; then
  echo "setup: these packages are missing and only root can install them:" >&2
  echo "  sudo apt-get install --no-install-recommends ${missing[*]}" >&2
  exit 1
fi

echo "setup: installing ${missing[*]}" >&2
log=$(mktemp)
trap 'rm -f "$log"' EXIT
export DEBIAN_FRONTEND=noninteractive
if ! { apt-get update && apt-get install -y --no-install-recommends "${missing[@]}"; } >"$log" 2>&1; then
  tail -n 20 "$log" >&2
  echo "setup: the packages could not be installed" >&2
  exit 1
fi
