#!/usr/bin/env bash
# scripts/test-fresh.sh [COMMAND]...
# For use before a release, as root; takes about twenty minutes. Creates a bare Debian 12 root, clones the last commit into
# it under /root and runs the README's first commands, or the COMMANDs. Mounts nothing from this machine: /proc and
# /dev/pts are new mounts, and /dev contains a few new device nodes.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
if [[ $(id -u) -ne 0 ]]; then
  echo "test-fresh: run it as root" >&2
  exit 1
fi
[[ $# -gt 0 ]] || set -- "bash scripts/demo.sh" "bash scripts/test.sh"
bash scripts/setup.sh package

root=$(mktemp -d)
log=$root.log
remove_root() {
  for folder in dev/pts proc; do
    if mountpoint -q "$root/$folder"; then umount "$root/$folder" || true; fi
  done
  if grep -qF " $root/" /proc/self/mountinfo; then
    echo "test-fresh: something is still mounted below $root; $root is not deleted" >&2
  else
    rm -rf --one-file-system "$root" "$log"
  fi
}
trap remove_root EXIT
chmod 755 "$root"

echo "== a bare system"
debootstrap --variant=minbase --include=git,ca-certificates bookworm "$root" >"$log" 2>&1 ||
  { tail -n 20 "$log" >&2; exit 1; }
mountpoint -q "$root/proc" || mount -t proc proc "$root/proc"
find "$root/dev" -mindepth 1 -xdev -delete
while read -r name major minor; do
  mknod -m 666 "$root/dev/$name" c "$major" "$minor"
done <<'END'
null 1 3
zero 1 5
full 1 7
random 1 8
urandom 1 9
tty 5 0
END
for link in fd:/proc/self/fd stdin:fd/0 stdout:fd/1 stderr:fd/2 ptmx:pts/ptmx; do
  ln -s "${link#*:}" "$root/dev/${link%%:*}"
done
mkdir "$root/dev/pts"
mount -t devpts -o newinstance,ptmxmode=0666 devpts "$root/dev/pts" # terminals of its own, for script(1)
echo "127.0.0.1 localhost" >"$root/etc/hosts" # usually written by the installer

git clone --quiet --no-hardlinks . "$root/root/tavo"
git -C "$root/root/tavo" checkout --quiet --detach "$(git rev-parse HEAD)"
for command in "$@"; do
  echo "== $command"
  SECONDS=0
  env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin HOME=/root \
    chroot "$root" sh -c "cd /root/tavo && $command"
  echo "== $command: passed in $SECONDS s"
done
