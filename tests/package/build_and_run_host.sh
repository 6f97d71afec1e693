#!/bin/sh
# Builds hosts outside the tree against an installed library and runs them against the installed zuv-service.
# Usage: build_and_run_host.sh WAY PREFIX WORK. WAY is cmake or pkg-config, PREFIX is the usr of the installation, WORK a
# directory for the build.
set -eu
way=$1 prefix=$2 work=$3
here=$(cd "$(dirname "$0")" && pwd)
architecture=$(g++ -print-multiarch)
example=$(ls "$prefix"/share/doc/*/examples/profile_host.cpp)
rm -rf "$work"
mkdir -p "$work"

case $way in
cmake)
    cmake -S "$here/host" -B "$work" -DCMAKE_PREFIX_PATH="$prefix" -DEXAMPLE="$example" \
        -DCMAKE_EXE_LINKER_FLAGS="-fuse-ld=gold -Wl,--as-needed" >"$work/cmake.log" ||
        { cat "$work/cmake.log"; exit 1; }
    cmake --build "$work" --parallel 2
    ;;
pkg-config)
    export PKG_CONFIG_PATH="$prefix/lib/$architecture/pkgconfig"
    for source in "$here/host/host.cpp" "$example"; do
        name=$(basename "$source" .cpp | sed s/profile_host/example/)
        # shellcheck disable=SC2046 # the flags are words
        g++ -std=c++17 -Wall -Wextra -Wpedantic -Werror $(pkg-config --cflags zuv_client_pro) "$source" \
            -o "$work/$name" $(pkg-config --libs zuv_client_pro)
    done
    for linker in bfd gold lld; do # which differ in what they make of a library that nothing seems to need
        command -v "ld.$linker" >/dev/null || continue
        g++ -std=c++17 $(pkg-config --cflags zuv_client_pro) -fuse-ld=$linker -Wl,--as-needed "$here/host/host.cpp" \
            -o "$work/host.$linker" $(pkg-config --libs zuv_client_pro)
    done
    ;;
*) echo "build_and_run_host.sh: no way '$way'" >&2; exit 2 ;;
esac

export LD_LIBRARY_PATH="$prefix/lib/$architecture"
cd "$work"
ldd ./host | grep "$prefix/lib/$architecture/libzuv_client_pro.so" >/dev/null ||
    ldd ./host | grep 'libzuv_client_pro.so.*=> /' # in a root of its own the library is where the loader looks
mkfifo said
"$prefix/bin/zuv-service" --port 0 >said &
service=$!
trap 'kill $service 2>/dev/null; wait $service 2>/dev/null || true' EXIT
read -r listening <said
endpoint="${listening#listening on }/zuv/v1.0/services/Profile"
for host in ./host*; do
    "$host" "$endpoint"
done
./example "$endpoint"
