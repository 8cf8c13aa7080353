#!/usr/bin/env bash
# scripts/format.sh [--check]
# Formats all C and C++ sources according to .clang-format. --check only reports what would change.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
case ${1:-} in
  "") options=(-i) ;;
  --check) options=(--dry-run --Werror) ;;
  *) echo "usage: format.sh [--check]" >&2; exit 2 ;;
esac
{ git ls-files --cached --others --exclude-standard 2>/dev/null || find . -path ./build -prune -o -type f -print; } |
  grep -E '\.(cpp|h|c)$' | xargs -d '\n' clang-format "${options[@]}"
