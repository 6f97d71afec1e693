#!/bin/bash
# The packages on Debian 12 with nothing else. Usage: clean_root.sh PACKAGES WORK, as root.
#   plain root:      runtime and tools install and run
#   with compilers:  all three install; hosts are built in both ways and run
# The two roots are made once, by debootstrap, and kept as archives in WORK; making them takes about two minutes.
# Exit status 77: skipped, for want of root or of debootstrap.
set -euo pipefail
packages=$(realpath "$1")
mkdir -p "$2"
work=$(realpath "$2")
here=$(cd "$(dirname "$0")" && pwd)
[ "$(id -u)" -eq 0 ] || { echo "skipped: only root can make a clean root"; exit 77; }
command -v debootstrap >/dev/null || { echo "skipped: debootstrap is not installed"; exit 77; }

. "$here/../../script/bare_root.sh"
root=$work/root
trap 'rm -rf --one-file-system "$root"' EXIT

within() { # command in the root
    env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin HOME=/root DEBIAN_FRONTEND=noninteractive LC_ALL=C chroot "$root" "$@"
}
install() { # names of packages, or patterns of files
    within sh -c "apt-get install -y -q --no-install-recommends $*" >"$work/apt.log" 2>&1 ||
        { cat "$work/apt.log"; return 1; }
}
restore() {
    bare_root "$work/$1.tar" "$root"
    mkdir "$root/packages"
    cp "$packages"/*.deb "$root/packages"
}

if [ ! -f "$work/compilers.tar" ]; then
    bare_root "$work/bare.tar" "$root"
    within apt-get update -q >"$work/apt.log" 2>&1
    install g++ cmake make pkg-config libssl-dev zlib1g-dev
    bare_root_keep "$work/compilers.tar" "$root"
fi

restore bare
within apt-get update -q >"$work/apt.log" 2>&1
install '/packages/libzuv-client-pro1*.deb' '/packages/zuv-tools*.deb'
within zuv-service --help >/dev/null
within ldconfig -p | grep libzuv_client_pro.so.1.5.1 >/dev/null
echo "ok    runtime and tools install on a plain root"

restore compilers
within apt-get update -q >"$work/apt.log" 2>&1
install '/packages/*.deb'
cp -r "$here" "$root/hosts"
for way in cmake pkg-config; do
    within sh /hosts/build_and_run_host.sh "$way" /usr "/built/$way"
    echo "ok    a host built with $way"
done
within apt-get purge -y -q libzuv-client-pro1.5.1 libzuv-client-pro-dev zuv-tools >"$work/apt.log" 2>&1
left=$(find "$root/usr" -ipath '*zuv*' -not -path '*/python3*')
[ -z "$left" ] || { echo "still there: $left"; exit 1; }
echo "ok    nothing stays"
