#!/bin/sh
# aarch64-sysroot.sh: unpacks Debian's arm64 libraries and the two Android headers that the library includes into
# build/aarch64-sysroot, for the cross compiler and for qemu. Adds no architecture and no package to this system.
# Does nothing if the sysroot exists.
set -eu
cd "$(dirname "$0")/.."
root=$PWD/build/aarch64-sysroot
packages='libc6-dev libstdc++-12-dev libavcodec-dev libavutil-dev libflac-dev libogg-dev libgtest-dev
  libbenchmark-dev nlohmann-json3-dev'
headers='android-libnativehelper-dev:amd64 android-liblog-dev:amd64' # only built for amd64
[ -e "$root/.complete" ] && [ "$(cat "$root/.complete")" = "$packages $headers" ] && exit 0

apt=$PWD/build/aarch64-apt
rm -rf "$root" "$apt"
mkdir -p "$root/usr/lib" "$apt/lists/partial" "$apt/archives/partial"
: >"$apt/status"
cat >"$apt/apt.conf" <<END
#clear APT::Architectures;
APT::Architecture "arm64";
APT::Architectures { "arm64"; "amd64"; };
APT::Install-Recommends "false";
APT::Sandbox::User "root";
Acquire::Languages "none";
Dir::State::lists "$apt/lists";
Dir::State::status "$apt/status";
Dir::Cache "$apt";
Dir::Cache::archives "$apt/archives";
END
export APT_CONFIG="$apt/apt.conf"
apt-get -qq update
# shellcheck disable=SC2086 # word splitting is intended
apt-get -qq -y --download-only install $packages >/dev/null
# shellcheck disable=SC2086
(cd "$apt/archives" && apt-get -qq download $headers)

ln -s usr/lib "$root/lib"
for package in "$apt"/archives/*.deb; do
  dpkg-deb --fsys-tarfile "$package" | tar -x --keep-directory-symlink -C "$root"
done
rm -rf "$apt"
echo "$packages $headers" >"$root/.complete"
