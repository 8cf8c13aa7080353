#!/bin/sh
# check_containers.sh FOLDER: what the image and the Kubernetes job in FOLDER must have.
set -eu
status=0
require() { # require FILE PATTERN
  grep -Eq -- "$2" "$folder/$1" || { echo "$1 lacks: $2" >&2; status=1; }
}
check() {
  folder=$1
  for pattern in '^USER [1-9][0-9]*' '^LABEL .*image\.title' 'rm -rf .*/var/lib/apt/lists' 'no-install-recommends'; do
    require Dockerfile "$pattern"
  done
  for pattern in 'runAsNonRoot: true' 'allowPrivilegeEscalation: false' 'readOnlyRootFilesystem: true' \
    'capabilities: \{drop: \[ALL\]\}' 'seccompProfile' 'limits: \{.*memory' '^  backoffLimitPerIndex: [0-9]'; do
    require kubernetes.yaml "$pattern"
  done
}
check "$1"
[ $status = 0 ] || exit 1
# The check itself: it must miss what is taken away.
broken=$(mktemp -d)
trap 'rm -rf "$broken"' EXIT
grep -v '^USER' "$1/Dockerfile" >"$broken/Dockerfile"
grep -v 'backoffLimitPerIndex' "$1/kubernetes.yaml" >"$broken/kubernetes.yaml"
missed=$(check "$broken" 2>&1 | wc -l)
[ "$missed" = 2 ]
