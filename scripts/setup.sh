#!/usr/bin/env bash
# scripts/setup.sh [build|java|tests|web|cluster|fuzz|measure|package|first]...
# Installs the Debian packages that are missing for the named groups; by default for build, java, tests, web and
# fuzz. build alone is enough for the library and the command. Prints nothing if no package is missing.
set -euo pipefail

build=(
  g++ cmake ninja-build pkg-config
  libavcodec-dev libavutil-dev libflac-dev libogg-dev
  libcli11-dev nlohmann-json3-dev libsqlite3-dev libpq-dev
)
java=(default-jdk-headless) # the bridge and the class for Java hosts
tests=(
  libgtest-dev libbenchmark-dev
  python3 python3-numpy python3-selenium chromium chromium-driver sqlite3 clang-format clang-tidy
  ffmpeg flac lame vorbis-tools
  doxygen groff-base zsh fish
  devscripts abigail-tools mypy python3-jsonschema python3-mir-eval python3-venv python3-pip python3-setuptools python3-wheel
)
web=(emscripten node-acorn nlohmann-json3-dev) # tavo.html: cmake --preset web
cluster=(slurm-wlm munge postgresql postgresql-client) # scripts/test-cluster.sh
fuzz=(clang libclang-rt-14-dev)
measure=(clang libclang-rt-14-dev gcovr valgrind)
package=(dpkg-dev debhelper dh-python doxygen lintian debootstrap) # scripts/test-package.sh, scripts/test-fresh.sh
first=("${build[@]}" "${java[@]}" "${fuzz[@]}" libgtest-dev python3 clang-format) # the first steps of scripts/test.sh

wanted=()
for group in "${@:-build java tests web fuzz}"; do
  for name in $group; do
    case $name in
      build) wanted+=("${build[@]}") ;;
      java) wanted+=("${java[@]}") ;;
      tests) wanted+=("${tests[@]}") ;;
      web) wanted+=("${web[@]}") ;;
      cluster) wanted+=("${cluster[@]}") ;;
      fuzz) wanted+=("${fuzz[@]}") ;;
      measure) wanted+=("${measure[@]}") ;;
      package) wanted+=("${package[@]}") ;;
      first) wanted+=("${first[@]}") ;;
      *) echo "setup: unknown group '$name'; groups: build, java, tests, web, cluster, fuzz, measure, package, first" >&2; exit 2 ;;
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
  echo "  sudo apt-get update && sudo apt-get install --no-install-recommends ${missing[*]}" >&2
  exit 1
fi

echo "setup: installing ${missing[*]}" >&2
log=$(mktemp)
trap 'rm -f "$log"' EXIT
export DEBIAN_FRONTEND=noninteractive
progress() { # prints the progress of apt-get: every step on a terminal, every 50th step elsewhere
  local every=50
  [[ -t 2 ]] && every=1
  awk -v every=$every '
    function step(name, count) {
      if (count % every == 0 || count == total)
        printf("%ssetup: %s %d of %d%s", every == 1 ? "\r" : "", name, count, total,
               every == 1 ? "\033[K" : "\n")
      fflush()
    }
    / newly installed/ { total = $3 }
    /^Get:/ { step("downloading", ++got) }
    /^Unpacking / { step("unpacking", ++unpacked) }
    /^Setting up / { step("configuring", ++done) }
    END { if (every == 1 && total > 0) printf("\n") }' >&2
}
if ! { apt-get update >"$log" 2>&1 &&
  apt-get install -y --no-install-recommends "${missing[@]}" 2>&1 | tee -a "$log" | progress; }; then
  tail -n 20 "$log" >&2
  echo "setup: the packages could not be installed" >&2
  exit 1
fi
