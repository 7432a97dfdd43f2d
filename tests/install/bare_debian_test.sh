#!/usr/bin/env bash
# Installs the packages in a new minimal Debian 12, and builds and runs callers there with CMake and
# pkg-config. Needs root and debootstrap. Takes some minutes.
#
#   bare_debian_test.sh SOURCE-DIRECTORY PACKAGE-DIRECTORY
set -euo pipefail

source_dir=$(realpath "$1")
packages=$(realpath "$2")
tree=$(mktemp -d)
trap 'umount "$tree/proc" 2>/dev/null || true; rm -rf --one-file-system "$tree"' EXIT

step() { printf '    %s\n' "$*"; }
within() { chroot "$tree" /usr/bin/env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin "$@"; }

# quietly COMMAND...: shows the command's output when it fails.
quietly() { "$@" >"$tree.log" 2>&1 || { tail -n 40 "$tree.log" >&2; return 1; }; rm "$tree.log"; }

step "debootstrap"
mirror=$(sed -nE 's#^(URIs:|deb( \[[^]]*\])?) *(https?://[^ ]+).*#\3#p' \
    /etc/apt/sources.list /etc/apt/sources.list.d/* 2>/dev/null | grep -v security | head -n 1 || true)
quietly debootstrap --variant=minbase bookworm "$tree" "${mirror:-http://deb.debian.org/debian}"
mount --bind /proc "$tree/proc"

step "apt-get install ./*.deb"
mkdir "$tree/packages"
cp "$packages"/*.deb "$tree/packages"
quietly within sh -c 'DEBIAN_FRONTEND=noninteractive apt-get install -y --no-install-recommends \
    /packages/*.deb g++ make cmake pkg-config'
within dpkg-query -W 'liborvadrcore*' | sed 's/^/    /'
if within test -e /usr/include/sqlite3.h; then
    echo "the packages depend on SQLite's header, which no caller needs" >&2
    exit 1
fi

# So far there is no systemd-tmpfiles. With it, installing the package makes the lock directory at once.
step "the lock directory"
within test ! -e /tmp/.orvadr_lock
quietly within sh -c 'DEBIAN_FRONTEND=noninteractive apt-get install -y --no-install-recommends \
    systemd-standalone-tmpfiles'
quietly within sh -c 'dpkg --install /packages/liborvadrcore1_*.deb'
[[ $(within stat -c '%F %a %U:%G' /tmp/.orvadr_lock) == "directory 755 root:root" ]]
quietly within rmdir /tmp/.orvadr_lock
quietly within systemd-tmpfiles --create --boot # as at boot
[[ $(within stat -c '%F %a %U:%G' /tmp/.orvadr_lock) == "directory 755 root:root" ]]

cp -r "$source_dir/tests/install" "$tree/callers"
step "find_package"
quietly within cmake -S /callers/find_package -B /build
quietly within cmake --build /build
step "pkg-config"
quietly within make -C /callers/pkg_config
for program in /build/consumer /callers/pkg_config/consumer; do
    within rm -rf /data
    within mkdir /data
    diff -u "$tree/callers/consumer.out" <(within "$program" /data)
done

step "the packaged examples"
quietly within cmake -S /usr/share/doc/liborvadrcore-examples/examples -B /examples
quietly within cmake --build /examples -j "$(nproc)"
within /examples/quick_start | sed 's/^/    /'

step "apt-get remove"
quietly within apt-get remove -y 'liborvadrcore*'
[[ -z $(find "$tree/usr/lib" "$tree/usr/include" -name '*orvadrcore*') ]]
