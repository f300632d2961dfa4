#!/usr/bin/env bash
# Installs the packages of both architectures side by side in a new Debian 12 and uses them there.
#
#     packaging/try.sh PACKAGES ROOT
#
# PACKAGES is the folder that scripts/package fills, ROOT the folder for the new Debian, which must not
# exist. Packages come from where this machine gets its own: its apt configuration is copied.
set -euo pipefail

packages=$1
root=$2
top=$(cd "$(dirname "$0")/.." && pwd)
export DEBIAN_FRONTEND=noninteractive LC_ALL=C

# Where this machine gets Debian 12 from.
mirror() {
    # shellcheck disable=SC2016  # apt-get replaces it
    apt-get indextargets --format '$(REPO_URI)' 'Codename: bookworm' 'Component: main' | sed -n 1p
}

copy_apt_configuration() {
    rm -rf "$root/etc/apt/sources.list" "$root/etc/apt/sources.list.d"
    cp -a /etc/apt/. "$root/etc/apt/"
    cp -a /usr/share/keyrings/. "$root/usr/share/keyrings/"
    cp -L /etc/resolv.conf /etc/hosts "$root/etc/"
}

inside() { chroot "$root" "$@"; }

debootstrap --variant=minbase bookworm "$root" "$(mirror)" >"$root.log" 2>&1 || {
    tail "$root.log"
    echo "try: no new Debian can be made here" >&2
    exit 1
}
copy_apt_configuration
mkdir "$root/kel"
cp "$packages"/*.deb "$root/kel/"
cp -a "$top/tests/install" "$top/README.md" "$root/kel/"

inside dpkg --add-architecture i386
# A list that cannot be read may be one that is not needed: installing tells.
inside apt-get update -q -q || echo "try: not every package list could be read" >&2
inside apt-get install -q -q -y --no-install-recommends cmake ninja-build g++ g++-multilib pkgconf \
    >"$root.log" 2>&1 || { tail "$root.log"; exit 1; }
mapfile -t files < <(find "$root/kel" -name '*.deb' -printf '/kel/%f\n')
inside apt-get install -q -q -y --no-install-recommends "${files[@]}" \
    >"$root.log" 2>&1 || { tail "$root.log"; exit 1; }
inside dpkg-query -W 'libkel*'
inside /kel/install/packages.sh /kel/README.md
